#include "core/Log.h"

#include <cstdio>
#include <ctime>
#include <memory>
#include <mutex>
#include <utility>

#include <windows.h>
#include <fcntl.h>
#include <io.h>
#include <wx/log.h>

#include "core/CriticalSection.h"
#include "core/Handles.h"
#include "core/InstallPaths.h"
#include "core/LogLine.h"

namespace tavi {
namespace {

constexpr int kInstallReads = 31;
constexpr unsigned long kInstallReadIntervalMs = 1000;
constexpr const char* kTimeFormat = "%d%b%Y %H:%M:%S";
// A message of 4095 characters, the time and the level.
constexpr std::size_t kMaxLineChars = 4095 + 65;
// No ANSI code page has more bytes for a UTF-16 unit.
constexpr std::size_t kMaxLineBytes = 3 * kMaxLineChars;

// Without a target wxWidgets creates one that opens a message box, which would block the host, in process attach
// forever.
[[maybe_unused]] const bool noTargetOfLastResort = [] {
    wxLog::DontCreateOnDemand();
    return true;
}();

wxLog* previousTarget = nullptr;
bool targetInstalled = false;

using File = std::unique_ptr<std::FILE, decltype(&std::fclose)>;

// Opens a text-mode stream whose writes the system appends: the C runtime would seek to the end and then write, over
// what another process has written in between. Returns null if that fails.
File openForAppending(const wxString& path)
{
    File stream(nullptr, &std::fclose);
    FileHandle file(CreateFileW(path.wc_str(), FILE_APPEND_DATA | SYNCHRONIZE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                                nullptr, OPEN_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr));
    if (!file)
        return stream;
    const int descriptor = _open_osfhandle(reinterpret_cast<std::intptr_t>(file.get()), _O_TEXT | _O_NOINHERIT);
    if (descriptor < 0)
        return stream;
    static_cast<void>(file.release());
    stream.reset(_fdopen(descriptor, "a"));
    if (!stream)
        _close(descriptor);
    return stream;
}

class FileLogTarget : public wxLogStderr {
  public:
    explicit FileLogTarget(File file) : wxLogStderr(file.get()), file_(std::move(file))
    {
        // Holds the longest line, so that a line is one write; but one above 1,000 bytes is written in pieces, since
        // text mode translates them in a buffer of that size.
        std::setvbuf(file_.get(), buffer_, _IOFBF, sizeof(buffer_));
    }

  protected:
    // Not the base's method, which ends the host without memory, and which chooses an encoding for each line and drops
    // one with half a surrogate pair. Here the code page replaces what it lacks.
    void DoLogRecord(wxLogLevel level, const wxString& message, const wxLogRecordInfo&) override
    {
        const std::lock_guard<CriticalSection> hold(lock_);
        const std::time_t now = std::time(nullptr);
        std::tm local{};
        localtime_s(&local, &now);
        char time[32];
        std::strftime(time, sizeof(time), kTimeFormat, &local);
        const wchar_t* const prefix = level == wxLOG_Error ? L"Error: " : level == wxLOG_Warning ? L"Warning: " : L"";
        const int chars = std::swprintf(line_, kMaxLineChars, L"%hs: %ls%.4095ls\n", time, prefix, message.wc_str());
        const int bytes =
            WideCharToMultiByte(CP_ACP, 0, line_, chars, bytes_, static_cast<int>(kMaxLineBytes), nullptr, nullptr);
        std::fwrite(bytes_, 1, static_cast<std::size_t>(bytes), file_.get());
        std::fflush(file_.get());
    }

  private:
    CriticalSection lock_;
    wchar_t line_[kMaxLineChars];
    char bytes_[kMaxLineBytes];
    // The stream's, which is closed first.
    char buffer_[kMaxLineBytes];
    const File file_;
};

} // namespace

bool openLog(unsigned long level)
{
    return openLog(level, [](unsigned long milliseconds) { Sleep(milliseconds); });
}

bool openLog(unsigned long level, const std::function<void(unsigned long)>& sleep)
{
    // The host may start before the service is installed. Without this wait, deliberately in process attach, support
    // would have no log of that session.
    for (int reads = 1; getDataFilePath(DataFile::directory).empty(); ++reads) {
        if (reads == kInstallReads)
            return false;
        sleep(kInstallReadIntervalMs);
    }
    const wxString path = getDataFilePath(DataFile::log);
    if (File file = openForAppending(path)) {
        wxLog* const before = wxLog::SetActiveTarget(new FileLogTarget(std::move(file)));
        if (!targetInstalled)
            previousTarget = before;
        targetInstalled = true;
    } else {
        logError(L"Unable to open logfile %ls", path.wc_str());
    }
    wxLog::SetLogLevel(level);
    wxLog::SetTimestamp(kTimeFormat);
    return true;
}

void closeLog() noexcept
{
    if (!targetInstalled)
        return;
    targetInstalled = false;
    std::unique_ptr<wxLog> ours(wxLog::SetActiveTarget(previousTarget));
}

} // namespace tavi
