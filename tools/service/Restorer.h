#pragma once

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "common/Handle.h"
#include "History.h"
#include "Installation.h"
#include "StatusServer.h"

namespace service {

struct RestoreSettings {
    // 0 is as fast as the disk.
    std::atomic<std::int64_t> bytesPerSecond{0};
    // Time that a restore searches before its first file.
    std::uint64_t searchMs = 0;
};

// Carries out the restore requests of the state database on a thread of its own, in their order. The rows of a request
// are deleted when it has ended or was cancelled; until then the next run of the service begins it anew.
class Restorer {
  public:
    Restorer(Installation installation, const RestoreSettings& settings, StatusServer& status);
    Restorer(const Restorer&) = delete;
    Restorer& operator=(const Restorer&) = delete;
    // Interrupts the restore that runs.
    ~Restorer();

    // Cancels the restore that runs or, when none does, the oldest request. Returns false when there is neither. Any
    // thread.
    bool cancel();
    bool isIdle();

  private:
    struct File {
        std::wstring path;
        std::wstring target;
        std::int64_t time;
        std::int64_t size;
        bool overwrite;
    };

    void work();
    void restore(std::int64_t request);
    void restoreFiles(const std::vector<File>& files);
    void restoreFile(History& history, const File& file);
    void copyContent(const std::filesystem::path& from, const std::filesystem::path& to);
    void reportBytes();
    void pause(std::uint64_t milliseconds);
    std::int64_t oldestRequest();
    std::vector<File> filesOf(std::int64_t request);
    void deleteRequest(std::int64_t request);

    const Installation installation_;
    const RestoreSettings& settings_;
    StatusServer& status_;
    std::mutex mutex_;
    // Signalled when the restore must end: it was cancelled, or stop_ is set.
    tools::Handle interrupt_ = tools::createEvent();
    std::atomic<bool> stop_{false};
    std::atomic<bool> restoring_{false};
    // Bytes that were copied since the last report.
    std::uint64_t unreported_ = 0;
    DWORD lastReport_ = 0;
    std::thread thread_;
};

} // namespace service
