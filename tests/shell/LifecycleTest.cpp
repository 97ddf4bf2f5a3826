#include "shell/Lifecycle.h"

#include <process.h>

#include "tests/support/Allocations.h"
#include "tests/support/LoadedModule.h"
#include "tools/filemanager/Counts.h"

using namespace tavi;
using namespace tavi::test;
using LifecycleTest = HostTest;

TEST_F(LifecycleTest, AdmitsProgramsByTheBeginningOfTheirName)
{
    const std::pair<HostKind, std::vector<const wchar_t*>> cases[] = {
        {HostKind::fileManager, {L"C:\\Windows\\explorer.exe", L"EXPLORER.EXE.old"}},
        {HostKind::toolOnly, {L"C:\\windows\\regsvr32.exe", L"C:\\VerClsid.exe", L"C:\\t\\_regdll.TMP"}},
        {HostKind::refused, {L"C:\\explorer.exe\\other.exe", L"C:\\t\\_RegDLL.tm", L"C:\\rundll32.exe", L"C:\\", L""}}};
    for (const auto& [kind, paths] : cases) {
        for (const wchar_t* path : paths)
            EXPECT_EQ(hostKindOf(path), kind) << path;
    }
    EXPECT_FALSE(LoadLibraryW(modulePath().c_str()));
    EXPECT_EQ(GetLastError(), DWORD{ERROR_DLL_INIT_FAILED});
}

TEST_F(LifecycleTest, AttachesWithoutALogIfMemoryRunsOut)
{
    const HINSTANCE program = GetModuleHandleW(nullptr);
    FailingAllocations(0), attachToFileManager(program, L"C:\\explorer.exe");
    EXPECT_EQ(moduleInstance(), program);
    EXPECT_TRUE(shellAllocator());
    detachFromFileManager(false);
    EXPECT_FALSE(shellAllocator());
}

TEST_F(LifecycleTest, GivesAToolTheClassesAndNothingElse)
{
    const wxString own = wxStandardPaths::Get().GetExecutablePath(), tool = own.BeforeLast(L'\\') + L"\\verclsid.exe";
    if (own != tool) {
        EXPECT_TRUE(CopyFileW(own.wc_str(), tool.wc_str(), FALSE));
        EXPECT_EQ(_wspawnl(_P_WAIT, tool.wc_str(), tool.wc_str(), L"--gtest_filter=*GivesATool*", nullptr), 0);
        DeleteFileW(tool.wc_str());
        service.install().Close(); // the copy has deleted the key at its end
        service.install().Create();
        return;
    }
    const int before = filemanager::threadCount();
    const LoadedModule module;
    module.object<IContextMenu>(ShellExt::kClassId, IID_IContextMenu);
    EXPECT_EQ(filemanager::threadCount(), before);
    EXPECT_EQ(GetFileAttributesW(service.file(L"tavi.log").c_str()), INVALID_FILE_ATTRIBUTES);
}
