#include <filesystem>
#include <fstream>
#include <memory>

#include <windows.h>

#include "bench/Bench.h"
#include "core/Handles.h"
#include "core/ScopeGuard.h"
#include "exclusions/Graylist.h"
#include "exclusions/UserProfiles.h"
#include "tests/support/Registry.h"

namespace tavi::bench {
namespace {

constexpr int kProfiles = 20;
constexpr const wchar_t* kFolders[] = {L"Cookies",   L"History", L"Local Settings", L"Local AppData", L"NetHood",
                                       L"PrintHood", L"Recent",  L"Cache",          L"CD Burning"};

void listFolder(const std::wstring& folder)
{
    WIN32_FIND_DATAW entry{};
    const FindHandle search(FindFirstFileW((folder + L"\\*").c_str(), &entry));
    while (search && FindNextFileW(search.get(), &entry)) {
    }
}

} // namespace

void runExclusions(Bench& bench)
{
    const test::InstalledService service;
    const test::TemporaryFolder root;
    const auto places = [&](int user) { return root.path() + L"\\user" + std::to_wstring(user); };
    std::vector<std::unique_ptr<test::AbsentUser>> users;
    for (int user = 0; user < kProfiles; ++user) {
        std::map<std::wstring, std::wstring> folders;
        for (const wchar_t* const name : kFolders) {
            folders[name] = places(user) + L"\\" + name;
            std::filesystem::create_directories(folders[name] + L"\\Microsoft\\Outlook");
        }
        users.push_back(std::make_unique<test::AbsentUser>(folders));
    }
    // Every build lists the Windows folder.
    wchar_t windows[MAX_PATH] = L"";
    GetWindowsDirectoryW(windows, MAX_PATH);
    const int files = bench.quick ? 500 : 5000;
    const auto file = [&](int number) { return windows + (L"\\tavibench" + std::to_wstring(number) + L".tmp"); };
    for (int number = 0; number < files; ++number)
        std::ofstream{std::filesystem::path(file(number))};
    const ScopeGuard removal([&] {
        for (int number = 0; number < files; ++number)
            DeleteFileW(file(number).c_str());
    });
    // The users' places are in the temporary folder, which would be one exclusion as a whole.
    SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere");
    buildGraylist(true);
    const double before = workingSet().now;
    // The system's share: hives, every user's folders by name, and a listing of each folder that has rules below it.
    const auto required = [&] {
        loadUserHives();
        for (const wchar_t* const name : kFolders)
            shellFolderPaths(name);
        unloadUserHives();
        listFolder(windows);
        for (int user = 0; user < kProfiles; ++user) {
            for (const wchar_t* const below : {L"", L"\\Local AppData", L"\\Local AppData\\Microsoft"})
                listFolder(places(user) + below);
        }
    };
    const auto times = medianSeconds(bench.repetitions, {[] { buildGraylist(true); }, required});
    bench.report("exclusions: build, 20 profiles / the system calls it needs", times[0] / times[1], 2, "");
    bench.report("exclusions: build", times[0] * 1e3, kNoBound, "ms");
    bench.report("exclusions: memory kept after rebuilding", (workingSet().now - before) / 1048576, 1, "MB");
    dropGraylist();
}

} // namespace tavi::bench
