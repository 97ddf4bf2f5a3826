#pragma once

#include <functional>
#include <string>
#include <vector>

#include <wx/log.h>

#include "core/Text.h"

namespace tavi::test {

// Takes the log of a test: one line per message, in UTF-8, as "level: " with wx's number of the level, and the line as
// written.
class LogCapture {
    class Target : public wxLog {
      public:
        std::vector<std::string> lines;
        std::function<void()> onNextLine;

      protected:
        void DoLogTextAtLevel(wxLogLevel level, const wxString& text) override
        {
            lines.push_back(std::to_string(level) + ": " + toUtf8(view(text)));
            if (const auto action = std::exchange(onNextLine, nullptr))
                action();
        }
    };

  public:
    LogCapture() : before_(wxLog::SetActiveTarget(&target_))
    {
        wxLog::DisableTimestamp();
    }
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;
    ~LogCapture()
    {
        wxLog::SetActiveTarget(before_);
    }
    // What was logged since the last call.
    std::vector<std::string> take()
    {
        return std::move(target_.lines);
    }
    std::string takeText()
    {
        std::string text;
        for (const std::string& line : take())
            text += line;
        return text;
    }
    // Called once, on the thread that logs: so a test acts in the middle of what it tests.
    void onNextLine(std::function<void()> action)
    {
        target_.onNextLine = std::move(action);
    }

  private:
    Target target_;
    wxLog* before_;
};

} // namespace tavi::test
