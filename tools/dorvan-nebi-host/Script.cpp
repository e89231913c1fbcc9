#include "Script.h"

#include "Console.h"

#include <utility>

Script::Script(std::chrono::seconds timeout, std::function<void(int status)> finished)
    : m_timeout(timeout), m_finished(std::move(finished))
{
    m_timer.SetAction([this] { OnTimeout(); });
}

void Script::Add(const wxString& title, Step step)
{
    m_steps.push_back({title, std::move(step)});
}

void Script::Start()
{
    m_current = 0;
    RunNext();
}

void Script::RunNext()
{
    if (m_current == m_steps.size())
    {
        End(0);
        return;
    }
    const std::size_t step = m_current;
    Console::Line("== " + Console::Number(step + 1) + "/" + Console::Number(m_steps.size()) + " " +
                  m_steps[step].title);
    m_timer.StartOnce(static_cast<int>(std::chrono::milliseconds(m_timeout).count()));
    m_steps[step].step([this, step](bool ok) { OnStepDone(step, ok); });
}

void Script::OnStepDone(std::size_t step, bool ok)
{
    if (m_ended || step != m_current)
    {
        return; // a late answer of a step that timed out
    }
    m_timer.Stop();
    if (!ok)
    {
        Console::Line("== FAILED at step " + Console::Number(step + 1) + "/" + Console::Number(m_steps.size()) + ": " +
                      m_steps[step].title);
        End(1);
        return;
    }
    ++m_current;
    RunNext();
}

void Script::OnTimeout()
{
    Console::Detail("no result within " + Console::Number(static_cast<unsigned long long>(m_timeout.count())) + " s");
    OnStepDone(m_current, false);
}

void Script::End(int status)
{
    m_ended = true;
    if (status == 0)
    {
        Console::Line("== done");
    }
    m_finished(status);
}
