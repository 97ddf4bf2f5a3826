#pragma once

#include <windows.h>

#include <mutex>
#include <string>
#include <string_view>

namespace filemanager {

// What stops a command: shown in the status bar, or printed with the line number of the script.
struct Failure {
    std::wstring text;
};

std::wstring hexCode(HRESULT result);
std::wstring readUtf8File(const std::wstring& path);

// Lines of UTF-8 to the standard output and to the log file, if there is one. Any thread may write.
class Output {
  public:
    Output() = default;
    Output(const Output&) = delete;
    Output& operator=(const Output&) = delete;
    ~Output();

    void openLog(const std::wstring& path);
    void line(std::wstring_view text);
    void error(std::wstring_view text);
    // Lines are kept in the record, but not written.
    void mute(bool muted);
    // The lines since the last startRecord.
    void startRecord();
    void stopRecord();
    std::wstring record();

  private:
    void write(std::wstring_view text, DWORD standardHandle);

    std::mutex mutex_;
    bool muted_ = false;
    bool recording_ = false;
    std::wstring record_;
    HANDLE log_ = INVALID_HANDLE_VALUE;
};

} // namespace filemanager
