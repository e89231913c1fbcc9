// Saves a configuration over and over until it is killed: the atomic save
// test kills it at random moments and then reads what is on disk.
//
//     config_writer PATH

#include <DorvanServices/GenericConfig.h>

#include <wx/init.h>
#include <wx/string.h>

#include <string>

int main(int argc, char** argv)
{
    if (argc != 2)
    {
        return 2;
    }
    wxInitializer initializer;
    GenericConfig config(wxString::FromUTF8(argv[1]));
    // Large enough that a save takes a while and could be caught half done.
    const wxString padding(wxUniChar('x'), 256 * 1024);
    for (long counter = 0;; ++counter)
    {
        config.SetValue<wxString>("padding", padding);
        config.SetValue<wxString>("counter", wxString::Format("%ld", counter));
    }
}
