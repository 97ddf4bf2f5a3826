#include "Backup.h"

#include <algorithm>
#include <ctime>
#include <cwchar>
#include <filesystem>
#include <map>

#include <windows.h>

#include "common/Text.h"
#include "Database.h"
#include "History.h"
#include "Installation.h"
#include "Manifest.h"

namespace service {
namespace {

// The state of a backed-up folder in the configuration database.
constexpr std::int64_t kBackedUpState = 6;
// The path in the manifest whose versions are the runs.
constexpr wchar_t kRunsPath[] = L"simple.map";

std::uint64_t ticks(const FILETIME& time)
{
    return std::uint64_t{time.dwHighDateTime} << 32 | time.dwLowDateTime;
}

// Returns the version of the file as it is now, without content.
Version describe(const std::wstring& path, std::int64_t time)
{
    WIN32_FILE_ATTRIBUTE_DATA data = {};
    if (!GetFileAttributesExW(path.c_str(), GetFileExInfoStandard, &data))
        throw tools::systemFailure(path, GetLastError());
    Version version;
    version.time = time;
    version.size = static_cast<std::int64_t>(std::uint64_t{data.nFileSizeHigh} << 32 | data.nFileSizeLow);
    version.modified = ticks(data.ftLastWriteTime);
    version.created = ticks(data.ftCreationTime);
    version.attributes = data.dwFileAttributes;
    return version;
}

// The service names contents by run and number, since nobody looks for equal ones.
std::wstring contentName(std::int64_t time, std::size_t number)
{
    wchar_t name[41];
    std::swprintf(name, 41, L"%032llx%08x", static_cast<unsigned long long>(time), static_cast<unsigned>(number));
    return name;
}

Version versionOfRun(std::int64_t time)
{
    FILETIME now;
    GetSystemTimeAsFileTime(&now);
    return {time, 0, ticks(now), ticks(now), 0, contentName(time, 0)};
}

} // namespace

void backUp(const std::wstring& folder, std::optional<std::int64_t> time)
{
    const Installation installation = findInstallation();
    History history(installation);
    // Two versions of a file never have the same time.
    const std::int64_t now = time.value_or(std::max<std::int64_t>(std::time(nullptr), history.lastRun() + 1));
    std::map<std::wstring, Version> former = history.newest();
    std::map<std::wstring, Version> versions = {{kRunsPath, versionOfRun(now)}};

    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder)) {
        if (!entry.is_regular_file())
            continue;
        const std::wstring path = entry.path().wstring();
        Version version = describe(path, now);
        const Version before = former[path];
        former.erase(path);
        if (before.size == version.size && before.modified == version.modified)
            continue;
        version.content = contentName(now, versions.size());
        std::filesystem::copy_file(path, installation.contentFile(version.content));
        versions[path] = std::move(version);
    }
    for (const auto& [path, version] : former) {
        if (version.size != kDeletedSize && path.compare(0, folder.size() + 1, folder + L"\\") == 0)
            versions[path].time = now;
    }
    history.addRun(versions);

    Database configuration(installation.configDatabase());
    Statement(configuration, "INSERT OR REPLACE INTO filesystem(state, folder) VALUES(?,?)")
        .bind(1, kBackedUpState)
        .bind(2, folder)
        .next();
    publishManifest(installation, history);
    tools::print(L"run " + std::to_wstring(now) + L": " + std::to_wstring(versions.size() - 1) + L" files changed");
}

} // namespace service
