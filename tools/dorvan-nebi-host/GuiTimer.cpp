#include "GuiTimer.h"

#include <wx/app.h>

#include <chrono>
#include <thread>

GuiTimer::GuiTimer() : m_state(std::make_shared<State>())
{
}

GuiTimer::~GuiTimer()
{
    Stop();
}

void GuiTimer::SetAction(std::function<void()> action)
{
    m_action = std::move(action);
}

void GuiTimer::StartOnce(int milliseconds)
{
    unsigned long generation = 0;
    {
        std::lock_guard<std::mutex> lock(m_state->mutex);
        generation = ++m_state->generation;
    }
    m_state->changed.notify_all();
    std::thread([state = m_state, generation, milliseconds, this] {
        std::unique_lock<std::mutex> lock(state->mutex);
        const bool superseded = state->changed.wait_for(lock, std::chrono::milliseconds(milliseconds),
                                                        [&] { return state->generation != generation; });
        lock.unlock();
        if (superseded || !wxTheApp)
        {
            return;
        }
        wxTheApp->CallAfter([state, generation, this] {
            {
                // Still the current start (and so the timer still exists)?
                std::lock_guard<std::mutex> current(state->mutex);
                if (state->generation != generation)
                {
                    return;
                }
                ++state->generation; // expired: runs once
            }
            if (m_action)
            {
                m_action();
            }
        });
    }).detach();
}

void GuiTimer::Stop()
{
    {
        std::lock_guard<std::mutex> lock(m_state->mutex);
        ++m_state->generation;
    }
    m_state->changed.notify_all();
}
