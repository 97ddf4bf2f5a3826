#pragma once

#include <functional>
#include <string>
#include <vector>

#include <wx/log.h>

#include "core/Utf8.h"

namespace tavi::test {

// Takes the log of a test: one line per message, in UTF-8, as "level: " with wx's number of the level, and the line as
// written.
class LogCapture : wxLog {
  public:
    LogCapture()
    {
        DisableTimestamp();
    }
    ~LogCapture() override
    {
        SetActiveTarget(before_);
    }
    // What was logged since the last call.
    std::vector<std::string> take()
    {
        return std::move(lines_);
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
        onNextLine_ = std::move(action);
    }

  private:
    void DoLogTextAtLevel(wxLogLevel level, const wxString& text) override
    {
        lines_.push_back(std::to_string(level) + ": " + toUtf8(view(text)));
        if (const auto action = std::exchange(onNextLine_, nullptr))
            action();
    }

    std::vector<std::string> lines_;
    std::function<void()> onNextLine_;
    wxLog* before_ = SetActiveTarget(this);
};

} // namespace tavi::test
