#pragma once

// The settings archive of the session: a zip file with a few settings files,
// as a host would prepare one before a backup, and the byte-for-byte check
// of a restored copy.

#include <wx/string.h>

namespace SettingsArchive
{
// Writes a new sample archive to path (a fresh one each time). Returns false,
// with the reason in error, when it cannot be written.
bool Create(const wxString& path, wxString& error);

// Whether the two files hold the same bytes, read block by block. size gets
// the length of the first; error says why they differ or cannot be read.
bool SameBytes(const wxString& first, const wxString& second, unsigned long long& size, wxString& error);
} // namespace SettingsArchive
