#include "shell/Lifecycle.h"

#include <atomic>
#include <stdexcept>
#include <thread>

#include <gtest/gtest.h>

#include "backupset/CurrentManifest.h"
#include "core/Handles.h"
#include "statedb/Database.h"
#include "tests/support/Counts.h"
#include "tests/support/Dialogs.h"

namespace tavi {
namespace {

TEST(Lifecycle, TheGateComparesTheBeginningOfTheName)
{
    const std::pair<const wchar_t*, HostKind> cases[] = {{L"C:\\Windows\\explorer.exe", HostKind::fileManager},
                                                         {L"EXPLORER.EXE", HostKind::fileManager},
                                                         {L"D:\\x\\explorer.exe.old", HostKind::fileManager},
                                                         {L"C:\\explorer.exe\\other.exe", HostKind::refused},
                                                         {L"C:\\windows\\regsvr32.exe", HostKind::toolOnly},
                                                         {L"C:\\VerClsid.exe", HostKind::toolOnly},
                                                         {L"C:\\t\\_regdll.TMP", HostKind::toolOnly},
                                                         {L"C:\\t\\_RegDLL.tm", HostKind::refused},
                                                         {L"C:\\windows\\rundll32.exe", HostKind::refused},
                                                         {L"C:\\", HostKind::refused},
                                                         {L"", HostKind::refused}};
    for (const auto& [path, kind] : cases)
        EXPECT_EQ(hostKindOf(path), kind) << path;

    wchar_t path[MAX_PATH];
    GetModuleFileNameW(nullptr, path, MAX_PATH);
    const std::wstring exe(path);
    EXPECT_EQ(LoadLibraryW((exe.substr(0, exe.rfind(L"\\tests\\")) + L"\\tavishell.dll").c_str()), nullptr);
    EXPECT_EQ(GetLastError(), DWORD{ERROR_DLL_INIT_FAILED});
}

TEST(Lifecycle, TheRuntimesShareOfAThreadOutlivesAnExceptionInFlight)
{
    std::string caught;
    try {
        try {
            throw std::runtime_error("kept");
        } catch (...) {
            releaseThreadRuntime();
            throw;
        }
    } catch (const std::runtime_error& error) {
        caught = error.what();
    }
    EXPECT_EQ(caught, "kept");
    releaseThreadRuntime();
}

TEST(Lifecycle, TheFirstManifestIsNullAndItsWatcherTheOnlyOne)
{
    const test::InstalledService service;
    const test::LogCapture log;
    const std::size_t before = test::countThreads();
    const auto isLoaded = [] { return static_cast<bool>(ManifestRef(GetCurrentManifest())); };
    const auto hasWatcher = [&](bool more) {
        return test::waitUntil([&] { return test::countThreads() == before + more; });
    };
    DbConnection database;
    database.open(service.file(L"tavistate.dat"));
    database.execDML("BEGIN EXCLUSIVE"); // holds up the load
    std::vector<std::thread> callers(8);
    for (std::thread& caller : callers)
        caller = std::thread([&] { EXPECT_FALSE(isLoaded()); });
    for (std::thread& caller : callers)
        caller.join();
    EXPECT_TRUE(!isLoaded() && hasWatcher(true));
    database.execDML("COMMIT");
    EXPECT_TRUE(test::waitUntil(isLoaded));

    // Takes the mutex of the start for this thread and keeps it.
    StopManifestWatcher();
    static std::atomic<bool> isNull{false};
    EXPECT_TRUE(hasWatcher(false));
    std::thread([&] { isNull = !isLoaded(); }).detach();
    EXPECT_TRUE(test::waitUntil([] { return isNull.load(); })) << "the call waits, or there is a manifest";
    EXPECT_TRUE(hasWatcher(false)) << "nothing was started";
    EXPECT_TRUE(test::waitUntil(isLoaded) && hasWatcher(true)) << "by the owner of the mutex";
    StopManifestWatcher();
}

} // namespace
} // namespace tavi
