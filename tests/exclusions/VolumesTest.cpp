#include "exclusions/Volumes.h"

#include <algorithm>
#include <cwchar>

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"
#include "tools/filemanager/Counts.h"

using namespace tavi;

namespace {

using namespace std::string_literals;

// Wine reports the type of every drive as unknown and has no mounted folders. These functions return what Windows does.
// The paths of each volume, and the error of reading them: ERROR_MORE_DATA (234) fails the second call.
std::vector<std::pair<std::wstring, DWORD>> volumes;
std::size_t current;

BOOL WINAPI findNext(HANDLE, LPWSTR name, DWORD size)
{
    std::swprintf(name, size, L"\\\\?\\Volume{%u}\\", static_cast<unsigned>(++current));
    return current < volumes.size();
}
HANDLE WINAPI findFirst(LPWSTR name, DWORD size)
{
    current = static_cast<std::size_t>(-1);
    const HANDLE search = volumes.empty() ? INVALID_HANDLE_VALUE : FindFirstVolumeW(name, size);
    findNext(search, name, size);
    return search;
}
UINT WINAPI driveType(LPCWSTR name)
{
    return std::wcscmp(name, L"\\\\?\\Volume{3}\\") == 0 ? DRIVE_REMOVABLE : DRIVE_FIXED;
}
// The name of drive C is a link in Windows' own namespace; drive E has no device.
DWORD WINAPI queryDevice(LPCWSTR name, LPWSTR device, DWORD size)
{
    const wchar_t* const format = current == 0 ? L"\\??\\c:" : L"\\Device\\%ls";
    const int length = std::swprintf(device, size, format, name);
    return current == 2 ? 0 : static_cast<DWORD>(length);
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    const auto& [text, error] = volumes[current];
    *length = static_cast<DWORD>(text.size());
    std::copy_n(text.begin(), std::min(size, *length), paths);
    SetLastError(size == 0 && error == 0 ? ERROR_MORE_DATA : error);
    return size > 0 && error == 0;
}

TEST(Volumes, AreFixedWithReadablePathsAndTheDeviceToWhichTheirNameLinks)
{
    test::LogCapture log;
    volumes = {
        {L"C:\\\0"s, 0},  {L"D:\\\0D:\\mount\\\0"s, 0}, {L"E:\\\0"s, 0}, {L"R:\\\0"s, 0}, {L"\0"s, 0}, {L"F:\\\0"s, 5},
        {L"G:\\\0"s, 234}};
    const VolumeFunctions native = VolumeFunctions::system();
    VolumeTable table({findFirst, findNext, FindVolumeClose, queryDevice, driveType, pathNames, native.openLink,
                       native.queryLink, native.closeLink});
    const auto refreshAndCountHandles = [&] {
        table.refreshVolumes();
        return filemanager::objectCounts().substr(0, filemanager::objectCounts().find(L','));
    };
    const std::wstring handles = refreshAndCountHandles();
    EXPECT_EQ(table.mountPoints(), (std::set<wxString>{L"C:\\", L"D:\\", L"D:\\mount\\", L"E:\\"}));
    wchar_t target[MAX_PATH];
    EXPECT_NE(QueryDosDeviceW(L"C:", target, MAX_PATH), 0u);
    EXPECT_EQ(table.mountPointOf(target), L"C:\\");
    EXPECT_EQ(table.mountPointOf(L"\\Device\\Volume{1}"), L"D:\\mount\\") << "the last one";
    EXPECT_EQ(table.mountPointOf(L""), L"E:\\");
    EXPECT_EQ(log.takeText(), "1: Error: Failed to retrieve mount point names: 00000005"
                              "1: Error: Failed to retrieve mount point names: 000000ea");
    EXPECT_EQ(refreshAndCountHandles(), handles) << "a link was not closed";
    // Without the native functions, which a system may lack.
    VolumeTable simple({findFirst, findNext, FindVolumeClose, queryDevice, driveType, pathNames});
    simple.refreshVolumes();
    EXPECT_EQ(simple.mountPointOf(L"\\??\\c:"), L"C:\\");
    volumes.clear();
    table.refreshVolumes();
    EXPECT_TRUE(table.mountPoints().empty());
}

} // namespace
