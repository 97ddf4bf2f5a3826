#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>

#include "Database.h"
#include "Installation.h"

namespace service {

constexpr std::int64_t kDeletedSize = -1;

// `time` is in seconds since 1970; `modified` and `created` are file times of the system.
struct Version {
    std::int64_t time = 0;
    std::int64_t size = kDeletedSize;
    std::uint64_t modified = 0;
    std::uint64_t created = 0;
    std::uint32_t attributes = 0;
    // 40 hexadecimal digits: the name of the file with the bytes. Empty for a deleted file.
    std::wstring content;
};

// The service's own record of every version of every file; the manifest is written from it.
class History {
  public:
    explicit History(const Installation& installation);

    // Returns the newest version of every file, deleted ones included.
    std::map<std::wstring, Version> newest();
    std::optional<Version> find(const std::wstring& path, std::int64_t time);
    // Returns the time of the newest run, or 0.
    std::int64_t lastRun();
    // Adds the versions of one run, all or none.
    void addRun(const std::map<std::wstring, Version>& versions);
    // Visits all versions by path and time.
    void forEach(const std::function<void(const std::wstring& path, const Version& version)>& visit);

  private:
    Database database_;
};

} // namespace service
