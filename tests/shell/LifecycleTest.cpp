#include "shell/Lifecycle.h"

#include <atomic>
#include <stdexcept>
#include <thread>

#include "manifest/CurrentManifest.h"
#include "core/RuntimeCleanup.h"
#include "core/Handles.h"
#include "statedb/Database.h"
#include "tests/support/Counts.h"
#include "tests/support/Dialogs.h"

namespace tavi {
namespace {

TEST(Lifecycle, TheGateComparesTheBeginningOfTheName)
{
    const std::pair<HostKind, std::vector<const wchar_t*>> cases[] = {
        {HostKind::fileManager, {L"C:\\Windows\\explorer.exe", L"EXPLORER.EXE", L"D:\\x\\explorer.exe.old"}},
        {HostKind::toolOnly, {L"C:\\windows\\regsvr32.exe", L"C:\\VerClsid.exe", L"C:\\t\\_regdll.TMP"}},
        {HostKind::refused, {L"C:\\explorer.exe\\other.exe", L"C:\\t\\_RegDLL.tm", L"C:\\rundll32.exe", L"C:\\", L""}}};
    for (const auto& [kind, paths] : cases) {
        for (const wchar_t* path : paths)
            EXPECT_EQ(hostKindOf(path), kind) << path;
    }
    EXPECT_EQ(LoadLibraryW(test::modulePath().c_str()), nullptr);
    EXPECT_EQ(GetLastError(), DWORD{ERROR_DLL_INIT_FAILED});
}

TEST(Lifecycle, TheRuntimesShareOfAThreadOutlivesAnExceptionInFlight)
{
    try {
        throw std::runtime_error("kept");
    } catch (const std::runtime_error&) {
        releaseThreadRuntime();
        EXPECT_TRUE(std::current_exception());
    }
}

TEST(Lifecycle, TheFirstManifestIsNullAndItsWatcherTheOnlyOne)
{
    const test::InstalledService service;
    const test::LogCapture log;
    const std::size_t before = test::countThreads();
    const auto isLoaded = [] { return static_cast<bool>(getCurrentManifest()); };
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
    stopManifestWatcher();
    static std::atomic<bool> isNull{false};
    EXPECT_TRUE(hasWatcher(false));
    std::thread([&] { isNull = !isLoaded(); }).detach();
    EXPECT_TRUE(test::waitUntil([] { return isNull.load(); })) << "the call waits, or there is a manifest";
    EXPECT_TRUE(hasWatcher(false)) << "nothing was started";
    EXPECT_TRUE(test::waitUntil(isLoaded) && hasWatcher(true)) << "by the owner of the mutex";
    stopManifestWatcher();
}

} // namespace
} // namespace tavi
