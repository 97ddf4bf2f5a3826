#include <initializer_list>
#include <string>

#include <gtest/gtest.h>

#include "backupset/ManifestWatcher.h"
#include "core/Options.h"
#include "statedb/StateLookups.h"
#include "tests/support/Registry.h"

// The stand-in for the service shares no code with the module: what one writes the other must understand.
namespace tavi {
namespace {

constexpr DWORD kLimit = 60000;

int runService(const std::wstring& arguments)
{
    wchar_t program[MAX_PATH];
    GetModuleFileNameW(nullptr, program, MAX_PATH);
    const std::wstring tests = program;
    std::wstring line =
        L"\"" + tests.substr(0, tests.find_last_of(L'\\')) + L"\\..\\tools\\service\\taviservice.exe\" " + arguments;
    STARTUPINFOW startup{};
    startup.cb = sizeof(startup);
    PROCESS_INFORMATION process{};
    if (!CreateProcessW(nullptr, line.data(), nullptr, nullptr, FALSE, CREATE_NO_WINDOW, nullptr, nullptr, &startup,
                        &process))
        return -1;
    DWORD code = DWORD(-1);
    if (WaitForSingleObject(process.hProcess, kLimit) == WAIT_OBJECT_0)
        GetExitCodeProcess(process.hProcess, &code);
    CloseHandle(process.hThread);
    CloseHandle(process.hProcess);
    return static_cast<int>(code);
}

void writeFile(const std::wstring& path, const char* text)
{
    const HANDLE file = CreateFileW(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr);
    DWORD written = 0;
    ASSERT_TRUE(WriteFile(file, text, static_cast<DWORD>(strlen(text)), &written, nullptr));
    CloseHandle(file);
}

// One line a file, below a folder: the name, then the time and size of each version.
std::wstring describeManifest(const std::wstring& folder)
{
    std::wstring text;
    const ManifestRef manifest(loadStoredManifest());
    for (std::uint32_t file = 0; manifest && file < manifest->fileCount(); ++file) {
        const wxString path = manifest->filePath(file);
        const ManifestPatchList patches = manifest->patches(file);
        text += path.StartsWith(folder) ? path.substr(folder.length()).ToStdWstring() : path.ToStdWstring();
        for (std::size_t i = 0; i < patches.size() && path != L"simple.map"; ++i)
            text += L" " + std::to_wstring(patches[i].timestamp()) + L":" + std::to_wstring(patches[i].fileSize());
        text += L"(" + std::to_wstring(patches.size()) + L")\n";
    }
    return text;
}

TEST(Service, TellsTheModuleWhatItHasBackedUp)
{
    test::InstalledService machine;
    const test::TemporaryFolder state;
    const test::TemporaryFolder place;
    const std::wstring folder = place.path() + L"\\Work";
    const std::wstring backup = L"backup \"" + place.path() + L"\\WORK\\\\\" --at ";
    CreateDirectoryW(folder.c_str(), nullptr);
    CreateDirectoryW((folder + L"\\Inner").c_str(), nullptr);
    EXPECT_EQ(runService(backup + L"1"), 1);
    ASSERT_EQ(runService(L"install \"" + state.path() + L"\""), 0);
    EXPECT_EQ(describeManifest(folder), L"");
    EXPECT_TRUE(readManifestTime());

    writeFile(folder + L"\\K\u00e9pt.txt", "1");
    writeFile(folder + L"\\Inner\\Gone.txt", "22");
    EXPECT_EQ(runService(backup + L"1000"), 0);
    DeleteFileW((folder + L"\\Inner\\Gone.txt").c_str());
    writeFile(folder + L"\\Changed.txt", "");
    EXPECT_EQ(runService(backup + L"2000"), 0);
    // An earlier run would stand behind a later one.
    EXPECT_EQ(runService(backup + L"2000"), 1);
    writeFile(folder + L"\\Inner\\Gone.txt", "again");
    writeFile(folder + L"\\Changed.txt", "4444");
    writeFile(folder + L"\\K\u00e9pt.txt", "in use");
    const HANDLE inUse =
        CreateFileW((folder + L"\\K\u00e9pt.txt").c_str(), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    EXPECT_EQ(runService(backup + L"3000"), 2);
    CloseHandle(inUse);

    EXPECT_EQ(describeManifest(folder), L"simple.map(3)\n"
                                        L"\\Changed.txt 2000:0 3000:4(2)\n"
                                        L"\\K\u00e9pt.txt 1000:1(1)\n"
                                        L"\\Inner\\Gone.txt 1000:2 2000:-1 3000:5(3)\n");
    EXPECT_EQ(FolderStateTable().getFolderState(folder), 6);
}

} // namespace
} // namespace tavi
