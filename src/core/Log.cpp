#include "core/Log.h"

#include <cstdio>
#include <memory>
#include <mutex>

#include <windows.h>
#include <wx/log.h>

#include "core/CriticalSection.h"
#include "core/InstallPaths.h"

namespace tavi {
namespace {

constexpr int kInstallReads = 31;
constexpr unsigned long kInstallReadIntervalMs = 1000;
constexpr std::size_t kLongestMessage = 4095;
// Above the longest line in bytes, so that each line is one write and processes that share the file do not tear it.
constexpr std::size_t kFileBuffer = 32768;

// The library's target of last resort is a message box, which would hold up the host, and in process attach for good.
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
        wxLogStderr::DoLogRecord(level, message.length() > kLongestMessage ? message.Left(kLongestMessage) : message,
                                 info);
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
    // The host may be up before the service has been installed; the wait inside process attach is deliberate.
    for (int reads = 1; getDataFilePath(kDataDirectory).empty(); ++reads) {
        if (reads == kInstallReads)
            return false;
        sleep(kInstallReadIntervalMs);
    }
    const wxString path = getDataFilePath(kLogFile);
    if (std::FILE* file = _wfopen(path.wc_str(), L"a")) {
        std::setvbuf(file, nullptr, _IOFBF, kFileBuffer);
        wxLog* const before = wxLog::SetActiveTarget(new FileLogTarget(file));
        if (!targetInstalled)
            previousTarget = before;
        targetInstalled = true;
    } else {
        wxLogError("Unable to open logfile %s", path);
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
    // The library's flag is one for the process: two plain save-and-restore pairs that overlap could leave it off for
    // good.
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
