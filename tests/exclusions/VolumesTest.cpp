#include "exclusions/Volumes.h"

#include <algorithm>
#include <cwchar>

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

// Wine reports the type of every drive as unknown and has neither mounted folders nor device links. These functions
// answer as Windows does.
namespace fake {

struct Volume {
    std::wstring paths;
    // The last errors of the calls for the length of the paths and for the paths.
    DWORD errors[2] = {ERROR_MORE_DATA, ERROR_SUCCESS};
};
std::vector<Volume> volumes;
std::size_t current;
int openHandles;

template <class Result>
Result WINAPI close(HANDLE)
{
    --openHandles;
    return 0;
}
BOOL WINAPI findNext(HANDLE, LPWSTR name, DWORD size)
{
    std::swprintf(name, size, L"\\\\?\\Volume{%u}\\", static_cast<unsigned>(++current));
    return current < volumes.size();
}
HANDLE WINAPI findFirst(LPWSTR name, DWORD size)
{
    current = static_cast<std::size_t>(-1);
    openHandles += !volumes.empty();
    return findNext(nullptr, name, size) ? GetProcessHeap() : INVALID_HANDLE_VALUE;
}
DWORD WINAPI queryDevice(LPCWSTR name, LPWSTR target, DWORD size)
{
    return static_cast<DWORD>(std::swprintf(target, size, L"\\Device\\%ls", name));
}
UINT WINAPI driveType(LPCWSTR name)
{
    return std::wcscmp(name, L"\\\\?\\Volume{2}\\") == 0 ? DRIVE_REMOVABLE : DRIVE_FIXED;
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    const Volume& volume = volumes[current];
    *length = static_cast<DWORD>(volume.paths.size());
    std::copy_n(volume.paths.begin(), std::min(size, *length), paths);
    SetLastError(volume.errors[size > 0]);
    return volume.errors[size > 0] == ERROR_SUCCESS;
}
NTSTATUS NTAPI openLink(HANDLE* link, ACCESS_MASK, OBJECT_ATTRIBUTES* attributes)
{
    const UNICODE_STRING& name = *attributes->ObjectName;
    const bool isLink = std::wstring_view(name.Buffer, name.Length / sizeof(wchar_t)) == L"\\Device\\Volume{1}";
    openHandles += isLink;
    *link = GetProcessHeap();
    return isLink ? 0 : static_cast<NTSTATUS>(0xC0000024);
}
NTSTATUS NTAPI queryLink(HANDLE, UNICODE_STRING* target, ULONG* bytes)
{
    constexpr std::wstring_view kName = L"\\Device\\Disk7";
    *bytes = kName.size() * sizeof(wchar_t);
    if (target->MaximumLength < *bytes)
        return static_cast<NTSTATUS>(0xC0000023);
    target->Length = static_cast<USHORT>(kName.copy(target->Buffer, kName.size()) * sizeof(wchar_t));
    return 0;
}

const VolumeFunctions functions{findFirst, findNext, close<BOOL>, queryDevice,    driveType,
                                pathNames, openLink, queryLink,   close<NTSTATUS>};

} // namespace fake

using namespace std::string_literals;

TEST(Volumes, AreTheMountPointsOfFixedVolumesUntilTheNextRefresh)
{
    for (const bool hasLinks : {true, false}) {
        fake::volumes = {{L"C:\\\0"s}, {L"D:\\\0C:\\mount\\\0"s}, {L"E:\\\0"s}};
        VolumeFunctions functions = fake::functions;
        functions.openLink = hasLinks ? fake::openLink : nullptr;
        VolumeTable table(functions);
        table.refreshVolumes();
        EXPECT_EQ(table.mountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\", L"D:\\"}));
        EXPECT_EQ(table.mountPointOf(L"\\Device\\Volume{0}"), L"C:\\");
        EXPECT_EQ(table.mountPointOf(hasLinks ? L"\\Device\\Disk7" : L"\\Device\\Volume{1}"), L"C:\\mount\\");
        fake::volumes.clear();
        table.refreshVolumes();
        EXPECT_TRUE(table.mountPoints().empty());
        EXPECT_EQ(fake::openHandles, 0);
    }
}

TEST(Volumes, AreSkippedAndLoggedWhereTheirPathsCannotBeRead)
{
    test::LogCapture log;
    constexpr DWORD kMore = ERROR_MORE_DATA;
    fake::volumes = {{L"C:\\\0"s, {0, 0}}, {L"D:\\\0"s, {5, 0}}, {}, {L"F:\\\0"s, {kMore, kMore}}, {L"G:\\\0"s}};
    VolumeTable table(fake::functions);
    table.refreshVolumes();
    EXPECT_EQ(table.mountPoints(), std::set<wxString>{L"G:\\"});
    const std::string failed = "1: Error: Failed to retrieve mount point names: ";
    EXPECT_EQ(log.takeText(), failed + "00000000" + failed + "00000005" + failed + "000000ea");
}

TEST(Volumes, OfThisMachineAreFound)
{
    VolumeFunctions system = VolumeFunctions::system();
    EXPECT_TRUE(system.openLink);
    system.driveType = fake::driveType;
    VolumeTable table(system);
    table.refreshVolumes();
    EXPECT_EQ(table.mountPoints().count(L"C:\\"), 1u);
}

} // namespace
} // namespace tavi
