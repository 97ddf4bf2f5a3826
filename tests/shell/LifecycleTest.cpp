#include "shell/Lifecycle.h"

#include <stdexcept>

#include <gtest/gtest.h>

#include "core/Handles.h"

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

} // namespace
} // namespace tavi
