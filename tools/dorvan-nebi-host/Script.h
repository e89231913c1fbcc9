#pragma once

// The steps a command takes, run one after the other on the GUI thread. A
// step starts its work and returns; when the work is over it calls the Done
// it was given, and the next step starts. A step that fails, or does not
// finish within the timeout, ends the script.

#include "GuiTimer.h"

#include <wx/string.h>

#include <chrono>
#include <functional>
#include <vector>

class Script
{
public:
    using Done = std::function<void(bool ok)>;
    using Step = std::function<void(Done done)>;

    // finished gets the exit status: 0 when every step succeeded, 1 otherwise.
    Script(std::chrono::seconds timeout, std::function<void(int status)> finished);

    Script(const Script&) = delete;
    Script& operator=(const Script&) = delete;

    void Add(const wxString& title, Step step);
    void Start();

private:
    void RunNext();
    void OnStepDone(std::size_t step, bool ok);
    void OnTimeout();
    void End(int status);

    struct Entry
    {
        wxString title;
        Step step;
    };

    const std::chrono::seconds m_timeout;
    std::function<void(int)> m_finished;
    std::vector<Entry> m_steps;
    std::size_t m_current = 0;
    bool m_ended = false;
    GuiTimer m_timer;
};
