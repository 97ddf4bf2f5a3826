#include "exclusions/Volumes.h"

#include <algorithm>
#include <cwchar>

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"

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
DWORD WINAPI queryDevice(LPCWSTR, LPWSTR device, DWORD size)
{
    return static_cast<DWORD>(std::swprintf(device, size, L"\\Device\\%u", static_cast<unsigned>(current)));
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    const auto& [text, error] = volumes[current];
    *length = static_cast<DWORD>(text.size());
    std::copy_n(text.begin(), std::min(size, *length), paths);
    SetLastError(size == 0 && error == 0 ? ERROR_MORE_DATA : error);
    return size > 0 && error == 0;
}

// A namespace in which device 0 links to a target, device 1 is no link, and the link of device 2 cannot be read.
int openLinks = 0;
NTSTATUS NTAPI openLink(HANDLE* link, ACCESS_MASK access, OBJECT_ATTRIBUTES* attributes)
{
    EXPECT_EQ(access, ACCESS_MASK{GENERIC_READ});
    EXPECT_EQ(attributes->Attributes, 0x40u);
    const std::wstring name(attributes->ObjectName->Buffer, attributes->ObjectName->Length / sizeof(wchar_t));
    if (name == L"\\Device\\1")
        return static_cast<NTSTATUS>(0xC0000024);
    *link = name == L"\\Device\\0" ? &openLinks : nullptr;
    ++openLinks;
    return 0;
}
NTSTATUS NTAPI queryLink(HANDLE link, UNICODE_STRING* target, ULONG* bytes)
{
    const std::wstring text = L"\\Device\\Target";
    *bytes = static_cast<ULONG>(text.size() * sizeof(wchar_t));
    if (target->MaximumLength < *bytes)
        return static_cast<NTSTATUS>(0xC0000023);
    target->Length = static_cast<USHORT>(*bytes);
    text.copy(target->Buffer, text.size());
    return link ? 0 : static_cast<NTSTATUS>(0xC0000022);
}
NTSTATUS NTAPI closeLink(HANDLE)
{
    return --openLinks;
}

TEST(Volumes, AreFixedWithReadablePathsAndTheDeviceToWhichTheirNameLinks)
{
    test::LogCapture log;
    volumes = {{L"C:\\\0"s, 0}, {L"D:\\\0"s, 0}, {L"E:\\\0"s, 0},  {L"R:\\\0"s, 0},
               {L"\0"s, 0},     {L"F:\\\0"s, 5}, {L"G:\\\0"s, 234}};
    VolumeTable table(
        {findFirst, findNext, FindVolumeClose, queryDevice, driveType, pathNames, openLink, queryLink, closeLink});
    table.refreshVolumes();
    EXPECT_EQ(table.mountPoints(), (std::set<wxString>{L"C:\\", L"D:\\", L"E:\\"}));
    EXPECT_EQ(table.mountPointOf(L"\\Device\\Target"), L"C:\\");
    EXPECT_EQ(table.mountPointOf(L"\\Device\\1"), L"D:\\");
    EXPECT_EQ(table.mountPointOf(L"\\Device\\2"), L"E:\\");
    EXPECT_EQ(openLinks, 0) << "not closed";
    EXPECT_EQ(log.takeText(), "1: Error: Failed to retrieve mount point names: 00000005"
                              "1: Error: Failed to retrieve mount point names: 000000ea");
    volumes.clear();
    table.refreshVolumes();
    EXPECT_TRUE(table.mountPoints().empty());
    // Without the native functions, which a system may lack, and without a device.
    EXPECT_TRUE(VolumeFunctions::system().openLink);
    volumes = {{L"C:\\\0C:\\mount\\\0"s, 0}};
    VolumeTable simple({findFirst, findNext, FindVolumeClose, QueryDosDeviceW, driveType, pathNames});
    simple.refreshVolumes();
    EXPECT_EQ(simple.mountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\"}));
    EXPECT_EQ(simple.mountPointOf(L""), L"C:\\mount\\") << "the last one";
}

} // namespace
