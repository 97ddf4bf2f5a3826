#include "shell/Lifecycle.h"

#include <atomic>
#include <stdexcept>
#include <thread>

#include <process.h>

#include "core/RuntimeCleanup.h"
#include "manifest/CurrentManifest.h"
#include "tests/shell/LoadedModule.h"
#include "tests/support/Counts.h"

namespace tavi {
namespace {

using namespace test;

TEST(Lifecycle, AdmitsProgramsByTheBeginningOfTheirName)
{
    const std::pair<HostKind, std::vector<const wchar_t*>> cases[] = {
        {HostKind::fileManager, {L"C:\\Windows\\explorer.exe", L"EXPLORER.EXE", L"D:\\x\\explorer.exe.old"}},
        {HostKind::toolOnly, {L"C:\\windows\\regsvr32.exe", L"C:\\VerClsid.exe", L"C:\\t\\_regdll.TMP"}},
        {HostKind::refused, {L"C:\\explorer.exe\\other.exe", L"C:\\t\\_RegDLL.tm", L"C:\\rundll32.exe", L"C:\\", L""}}};
    for (const auto& [kind, paths] : cases) {
        for (const wchar_t* path : paths)
            EXPECT_EQ(hostKindOf(path), kind) << path;
    }
}

using LifecycleTest = HostTest;

// Runs as a program that the module refuses, and starts a copy of itself as one of the tools.
TEST_F(LifecycleTest, GivesAToolTheClassesAndNothingElse)
{
    const wxString own = wxStandardPaths::Get().GetExecutablePath(), tool = own.BeforeLast(L'\\') + L"\\verclsid.exe";
    if (own != tool) {
        EXPECT_EQ(LoadLibraryW(modulePath().c_str()), nullptr);
        EXPECT_EQ(GetLastError(), DWORD{ERROR_DLL_INIT_FAILED});
        EXPECT_TRUE(CopyFileW(own.wc_str(), tool.wc_str(), FALSE));
        EXPECT_EQ(_wspawnl(_P_WAIT, tool.wc_str(), tool.wc_str(), L"--gtest_filter=*GivesATool*", nullptr), 0);
        DeleteFileW(tool.wc_str());
        // The other program has deleted the key at its end.
        service.install().Close();
        service.install().Create();
        return;
    }
    const std::size_t before = countThreads();
    const LoadedModule module;
    module.object<IContextMenu>(ShellExt::kClassId, IID_IContextMenu);
    EXPECT_EQ(countThreads(), before);
    EXPECT_EQ(GetFileAttributesW(service.file(L"tavi.log").c_str()), INVALID_FILE_ATTRIBUTES);
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
    const InstalledService service;
    const LogCapture log;
    const std::size_t before = countThreads();
    const auto isLoaded = [] { return static_cast<bool>(getCurrentManifest()); };
    const auto hasWatcher = [&](bool more) { return waitUntil([&] { return countThreads() == before + more; }); };
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
    EXPECT_TRUE(waitUntil(isLoaded));

    // Takes the mutex of the start for this thread and keeps it.
    stopManifestWatcher();
    static std::atomic<bool> isNull{false};
    EXPECT_TRUE(hasWatcher(false));
    std::thread([&] { isNull = !isLoaded(); }).detach();
    EXPECT_TRUE(waitUntil([] { return isNull.load(); })) << "the call waits, or there is a manifest";
    EXPECT_TRUE(hasWatcher(false)) << "nothing was started";
    EXPECT_TRUE(waitUntil(isLoaded) && hasWatcher(true)) << "by the owner of the mutex";
    stopManifestWatcher();
}

} // namespace
} // namespace tavi
