#pragma once

#include <atomic>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ContentStore.h"
#include "Database.h"
#include "History.h"
#include "Installation.h"
#include "StatusServer.h"

namespace service {

struct RunSettings {
    // Bytes a second; 0 is as fast as it goes.
    std::atomic<std::int64_t> rate{0};
    // Milliseconds that a restore searches before its first file.
    DWORD search = 0;
    DWORD poll = 250;
};

// Carries out the restore requests of the state database on a thread of its own, in their order. A request's rows go
// when it has ended or was cancelled; until then another run of the service begins it anew.
class Restorer {
  public:
    Restorer(const Installation& installation, const RunSettings& settings, StatusServer& status);
    Restorer(const Restorer&) = delete;
    Restorer& operator=(const Restorer&) = delete;
    // Leaves a running restore where it is.
    ~Restorer();

    // The restore in progress or, when none is, the oldest request. False when there is neither. Any thread.
    bool cancel();
    bool isIdle();

  private:
    struct File {
        std::wstring path;
        std::wstring target;
        std::int64_t time = 0;
        std::int64_t size = 0;
        bool overwrite = false;
    };

    void work();
    // False when it was left where it is.
    void restore(std::int64_t id);
    void restoreFile(History& history, const File& file);
    void copyContent(const std::wstring& from, const std::wstring& to);
    void report(std::uint64_t bytes, bool now);
    void pause(std::uint64_t milliseconds);
    std::int64_t oldestRequest();
    // Tries until it is done; false when the service stops before.
    bool forget(std::int64_t id);

    const Installation installation_;
    const RunSettings& settings_;
    StatusServer& status_;
    ContentStore store_;
    // Signalled: whatever goes on ends. The two flags tell why.
    std::mutex mutex_;
    Handle interrupt_ = makeEvent();
    std::atomic<bool> stop_{false};
    std::atomic<bool> cancelled_{false};
    std::atomic<bool> restoring_{false};
    // Of the file in work, the bytes that have not been counted as done.
    std::uint64_t left_ = 0;
    std::uint64_t unreported_ = 0;
    DWORD lastReport_ = 0;
    std::thread thread_;
};

} // namespace service
