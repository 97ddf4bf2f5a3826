#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "Database.h"
#include "Installation.h"

namespace service {

constexpr std::int64_t kDeletedSize = -1;

// File times are the system's own 64-bit counts; 0 where there is none.
struct Version {
    std::int64_t time = 0;
    std::int64_t size = kDeletedSize;
    std::uint64_t modified = 0;
    std::uint64_t created = 0;
    std::uint32_t attributes = 0;
    std::wstring content;
};

// The service's own record of every version of every file; the manifest is written from it.
class History {
  public:
    explicit History(const Installation& installation);

    std::map<std::wstring, Version> newest();
    std::optional<Version> find(const std::wstring& path, std::int64_t time);
    std::int64_t lastRun();
    // One run, whole or not at all.
    void addRun(const std::map<std::wstring, Version>& versions);
    std::string manifestText();

  private:
    Database database_;
};

// Seconds since 1970, as the manifest tells times.
std::uint32_t unixSeconds(std::uint64_t fileTime);

// The path whose versions are the runs.
constexpr wchar_t kRunsPath[] = L"simple.map";

} // namespace service
