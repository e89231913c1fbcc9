#pragma once

// A one-shot timer whose action runs on the GUI thread, through the
// application's event loop like every connector result.
//
// Not wxTimer: in a console application of the wxWidgets base library on
// Windows, wxTimer's events never arrive (its console event loop does not
// deliver the timer messages), so a host that waits on one waits for ever.
// This one waits on a thread of its own and hands the action over with
// CallAfter, which works wherever the connector's deliveries work.

#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>

class GuiTimer
{
public:
    GuiTimer();
    ~GuiTimer();

    GuiTimer(const GuiTimer&) = delete;
    GuiTimer& operator=(const GuiTimer&) = delete;

    // What runs, on the GUI thread, when the timer expires.
    void SetAction(std::function<void()> action);
    // (Re)starts the timer; an earlier start no longer counts.
    void StartOnce(int milliseconds);
    // The action of the last start will not run.
    void Stop();

private:
    struct State
    {
        std::mutex mutex;
        std::condition_variable changed;
        unsigned long generation = 0; // bumped by every start and stop
    };

    std::shared_ptr<State> m_state;
    std::function<void()> m_action;
};
