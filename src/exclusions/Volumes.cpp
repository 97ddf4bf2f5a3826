#include "exclusions/Volumes.h"

#include <algorithm>
#include <cwchar>
#include <mutex>
#include <string_view>
#include <vector>

#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/ScopeGuard.h"

namespace tavi {
namespace {

constexpr DWORD kVolumeNameCharacters = 1023;
constexpr DWORD kDeviceCharacters = 1024;
constexpr std::wstring_view kVolumePrefix = L"\\\\?\\";
constexpr NTSTATUS kBufferTooSmall = static_cast<NTSTATUS>(0xC0000023);
constexpr ULONG kCaseInsensitive = 0x40;

VolumeTable theTable(VolumeFunctions::system());

} // namespace

VolumeFunctions VolumeFunctions::system()
{
    VolumeFunctions found;
    if (const HMODULE ntdll = GetModuleHandleW(L"ntdll.dll")) {
        findFunction(ntdll, "NtOpenSymbolicLinkObject", found.openLink);
        findFunction(ntdll, "NtQuerySymbolicLinkObject", found.queryLink);
        findFunction(ntdll, "NtClose", found.closeLink);
    }
    if (!found.openLink || !found.queryLink || !found.closeLink)
        found.openLink = nullptr;
    return found;
}

VolumeTable& volumeTable()
{
    return theTable;
}

void VolumeTable::refreshVolumes()
{
    const std::lock_guard guard(lock_);
    mountPoints_.clear();
    devices_.clear();
    wchar_t name[kVolumeNameCharacters + 1] = L"";
    const HANDLE search = functions_.findFirst(name, kVolumeNameCharacters);
    if (search == INVALID_HANDLE_VALUE)
        return;
    const ScopeGuard closing([&] { functions_.findClose(search); });
    do
        addVolume(name);
    while (functions_.findNext(search, name, kVolumeNameCharacters));
}

wxString VolumeTable::resolveLink(const wxString& device) const
{
    if (!functions_.openLink)
        return device;
    // The structure counts bytes. Its pointer is not to const, but the call only reads.
    UNICODE_STRING name{};
    name.Buffer = const_cast<wchar_t*>(static_cast<const wchar_t*>(device.wc_str()));
    name.Length = static_cast<USHORT>(device.length() * sizeof(wchar_t));
    name.MaximumLength = name.Length;
    OBJECT_ATTRIBUTES attributes{};
    attributes.Length = sizeof(attributes);
    attributes.ObjectName = &name;
    attributes.Attributes = kCaseInsensitive;
    HANDLE link = nullptr;
    if (functions_.openLink(&link, GENERIC_READ, &attributes) < 0)
        return device;
    const ScopeGuard closing([&] { functions_.closeLink(link); });
    wxString target = device;
    UNICODE_STRING text{};
    ULONG bytes = 0;
    if (functions_.queryLink(link, &text, &bytes) == kBufferTooSmall && bytes > 0 && bytes <= 0xFFFE) {
        std::vector<wchar_t> buffer(bytes / sizeof(wchar_t) + 1);
        text.Buffer = buffer.data();
        text.MaximumLength = static_cast<USHORT>(bytes);
        if (functions_.queryLink(link, &text, &bytes) >= 0)
            target = wxString(buffer.data(), text.Length / sizeof(wchar_t));
    }
    return target;
}

void VolumeTable::addVolume(const wxString& name)
{
    const wxString bare = name.EndsWith(L"\\") ? name.Left(name.length() - 1) : name;
    wchar_t target[kDeviceCharacters] = L"";
    if (!functions_.queryDevice(bare.Mid(kVolumePrefix.size()).wc_str(), target, kDeviceCharacters))
        target[0] = L'\0';
    const wxString device = resolveLink(target);
    if (functions_.driveType(name.wc_str()) != DRIVE_FIXED)
        return;

    DWORD characters = 0;
    if (functions_.pathNames(name.wc_str(), nullptr, 0, &characters) || GetLastError() != ERROR_MORE_DATA) {
        logError(L"Failed to retrieve mount point names: %08lx", GetLastError());
        return;
    }
    std::vector<wchar_t> paths;
    try {
        paths.resize(characters);
    } catch (const std::bad_alloc&) {
        logError(L"Failed to allocate memory for mount point names");
        return;
    }
    if (!functions_.pathNames(name.wc_str(), paths.data(), static_cast<DWORD>(paths.size()), &characters)) {
        logError(L"Failed to retrieve mount point names: %08lx", GetLastError());
        return;
    }
    const std::size_t end = std::min<std::size_t>(characters, paths.size());
    for (std::size_t at = 0; at < end && paths[at] != L'\0';) {
        const wxString path(paths.data() + at, wcsnlen(paths.data() + at, end - at));
        mountPoints_[path] = device;
        devices_[device] = path;
        at += path.length() + 1;
    }
}

std::set<wxString> VolumeTable::mountPoints() const
{
    const std::lock_guard guard(lock_);
    std::set<wxString> paths;
    for (const auto& [path, device] : mountPoints_)
        paths.insert(path);
    return paths;
}

wxString VolumeTable::mountPointOf(const wxString& device) const
{
    const std::lock_guard guard(lock_);
    const auto found = devices_.find(device);
    return found == devices_.end() ? wxString() : found->second;
}

} // namespace tavi
