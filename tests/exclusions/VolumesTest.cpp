#include "exclusions/Volumes.h"

#include <algorithm>
#include <cwchar>

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

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
    return std::wcscmp(name, L"\\\\?\\Volume{2}\\") == 0 ? DRIVE_REMOVABLE : DRIVE_FIXED;
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    const auto& [text, error] = volumes[current];
    *length = static_cast<DWORD>(text.size());
    std::copy_n(text.begin(), std::min(size, *length), paths);
    SetLastError(size == 0 && error == 0 ? ERROR_MORE_DATA : error);
    return size > 0 && error == 0;
}

TEST(Volumes, AreTheMountPointsOfFixedVolumesWhosePathsCanBeRead)
{
    using namespace std::string_literals;
    test::LogCapture log;
    volumes = {{L"\0"s, 0}, {L"F:\\\0"s, 5}, {L"E:\\\0"s, 0}, {L"G:\\\0"s, 234}, {L"C:\\\0C:\\mount\\\0"s, 0}};
    // Without the native functions, which a system may lack.
    VolumeTable table({findFirst, findNext, FindVolumeClose, QueryDosDeviceW, driveType, pathNames});
    table.refreshVolumes();
    EXPECT_EQ(table.mountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\"}));
    EXPECT_EQ(table.mountPointOf(L""), L"C:\\mount\\") << "the last one without a device";
    EXPECT_EQ(log.takeText(), "1: Error: Failed to retrieve mount point names: 00000005"
                              "1: Error: Failed to retrieve mount point names: 000000ea");
    volumes.clear();
    table.refreshVolumes();
    EXPECT_TRUE(table.mountPoints().empty() && VolumeFunctions::system().openLink);
}

} // namespace
} // namespace tavi
