#include "core/Log.h"

#include <cstdio>
#include <memory>
#include <mutex>

#include <windows.h>
#include <wx/log.h>

#include "core/CriticalSection.h"
#include "core/InstallPaths.h"
#include "core/LogLine.h"

namespace tavi {
namespace {

constexpr int kInstallReads = 31;
constexpr unsigned long kInstallReadIntervalMs = 1000;
constexpr std::size_t kMaxMessageLength = 4095;
// More than the longest line: each line is one write, so lines of the processes that share the file stay whole.
constexpr std::size_t kFileBufferBytes = 32768;

// Without a target wxWidgets creates one that opens a message box, which would block the host, in process attach
// forever.
[[maybe_unused]] const bool noTargetOfLastResort = [] {
    wxLog::DontCreateOnDemand();
    return true;
}();

CriticalSection silencerLock;
int silencers = 0;
bool loggingBefore = true;

wxLog* previousTarget = nullptr;
bool targetInstalled = false;

class FileLogTarget : public wxLogStderr {
  public:
    explicit FileLogTarget(std::FILE* file) : wxLogStderr(file), file_(file) {}
    FileLogTarget(const FileLogTarget&) = delete;
    FileLogTarget& operator=(const FileLogTarget&) = delete;
    ~FileLogTarget() override
    {
        if (file_ && file_ != stderr)
            std::fclose(file_);
    }

  protected:
    void DoLogRecord(wxLogLevel level, const wxString& message, const wxLogRecordInfo& info) override
    {
        const std::lock_guard<CriticalSection> hold(lock_);
        wxLogStderr::DoLogRecord(
            level, message.length() > kMaxMessageLength ? message.Left(kMaxMessageLength) : message, info);
    }

  private:
    std::FILE* file_;
    CriticalSection lock_;
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
    if (std::FILE* file = _wfopen(path.wc_str(), L"a")) {
        std::setvbuf(file, nullptr, _IOFBF, kFileBufferBytes);
        wxLog* const before = wxLog::SetActiveTarget(new FileLogTarget(file));
        if (!targetInstalled)
            previousTarget = before;
        targetInstalled = true;
    } else {
        logError(L"Unable to open logfile %ls", path.wc_str());
    }
    wxLog::SetLogLevel(level);
    wxLog::SetTimestamp("%d%b%Y %H:%M:%S");
    return true;
}

void closeLog() noexcept
{
    if (!targetInstalled)
        return;
    targetInstalled = false;
    std::unique_ptr<wxLog> ours(wxLog::SetActiveTarget(previousTarget));
}

LogSilencer::LogSilencer()
{
    // wxWidgets' flag is one for the process: two plain pairs of save and restore that overlap could leave it off.
    const std::lock_guard<CriticalSection> hold(silencerLock);
    if (silencers++ == 0)
        loggingBefore = wxLog::EnableLogging(false);
}

LogSilencer::~LogSilencer()
{
    const std::lock_guard<CriticalSection> hold(silencerLock);
    if (--silencers == 0)
        wxLog::EnableLogging(loggingBefore);
}

} // namespace tavi
