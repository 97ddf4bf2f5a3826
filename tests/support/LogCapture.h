#pragma once

#include <functional>
#include <string>
#include <vector>

#include <wx/log.h>

#include "core/Utf8.h"

namespace tavi::test {

// Captures the log of a test as UTF-8 lines: wxWidgets' number of the level, ": " and the line as written.
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
    // Returns the lines since the last call.
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
    // Sets a function that the thread that logs the next line calls, in the middle of the code under test.
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
