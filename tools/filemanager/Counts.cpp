#include "Counts.h"

#include <algorithm>
#include <atomic>
#include <cstdint>

#include <windows.h>
#include <psapi.h>
#include <tlhelp32.h>
#include <winternl.h>

#include "common/Handle.h"
#include "common/Text.h"

namespace filemanager {
namespace {

// Wine 8 returns 0 from GetGuiResources, but keeps the table of the process's GDI objects where Windows keeps its own.
std::size_t gdiObjects()
{
    struct Entry {
        std::uint64_t object;
        DWORD owner;
        WORD unique;
        BYTE type;
        BYTE flags;
        std::uint64_t user;
    };
    if (const DWORD count = GetGuiResources(GetCurrentProcess(), GR_GDIOBJECTS))
        return count;
    constexpr std::size_t kTableOfPeb = sizeof(void*) == 4 ? 0x94 : 0xF8;
    PROCESS_BASIC_INFORMATION process = {};
    NtQueryInformationProcess(GetCurrentProcess(), ProcessBasicInformation, &process, sizeof process, nullptr);
    const auto peb = reinterpret_cast<const BYTE*>(process.PebBaseAddress);
    const auto table = *reinterpret_cast<const Entry* const*>(peb + kTableOfPeb);
    MEMORY_BASIC_INFORMATION memory = {};
    if (!table || !VirtualQuery(table, &memory, sizeof memory))
        return 0;
    return static_cast<std::size_t>(std::count_if(table, table + memory.RegionSize / sizeof(Entry),
                                                  [](const Entry& entry) { return entry.type != 0; }));
}

// Wine 8 does not count handles either: every value that can be a handle is tried.
DWORD handles()
{
    constexpr ULONG_PTR kEndOfHandles = 0x10000;
    DWORD count = 0;
    GetProcessHandleCount(GetCurrentProcess(), &count);
    if (count > 0)
        return count;
    for (ULONG_PTR value = 4; value < kEndOfHandles; value += 4) {
        DWORD flags = 0;
        count += GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1u : 0u;
    }
    return count;
}

SIZE_T privateKilobytes()
{
    PROCESS_MEMORY_COUNTERS memory = {};
    GetProcessMemoryInfo(GetCurrentProcess(), &memory, sizeof memory);
    return memory.PagefileUsage / 1024;
}

std::wstring watchedLibrary;
std::atomic<int> timesUnmapped{0};

struct LibraryNotice {
    ULONG flags;
    const UNICODE_STRING* path;
    const UNICODE_STRING* name;
};

// Called by the loader, under its lock.
void CALLBACK countUnload(ULONG reason, const LibraryNotice* notice, void*)
{
    constexpr ULONG kUnmapped = 2;
    timesUnmapped += reason == kUnmapped && lstrcmpiW(notice->name->Buffer, watchedLibrary.c_str()) == 0;
}

} // namespace

int threadCount()
{
    const tools::Handle snapshot(CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0));
    THREADENTRY32 entry = {};
    entry.dwSize = sizeof entry;
    int count = 0;
    for (BOOL more = Thread32First(snapshot.get(), &entry); more; more = Thread32Next(snapshot.get(), &entry))
        count += entry.th32OwnerProcessID == GetCurrentProcessId();
    return count;
}

std::wstring objectCounts()
{
    return L"handles " + std::to_wstring(handles()) + L", gdi " + std::to_wstring(gdiObjects()) + L", threads " +
           std::to_wstring(threadCount()) + L", memory " + std::to_wstring(privateKilobytes()) + L" KB, unloads " +
           std::to_wstring(timesUnmapped);
}

void watchUnloads(const std::wstring& library)
{
    using Register = LONG(NTAPI*)(ULONG, decltype(&countUnload), void*, void**);
    const auto address =
        reinterpret_cast<void*>(GetProcAddress(GetModuleHandleW(L"ntdll.dll"), "LdrRegisterDllNotification"));
    void* cookie = nullptr;
    watchedLibrary = library;
    if (!address || reinterpret_cast<Register>(address)(0, countUnload, nullptr, &cookie) != 0)
        throw tools::Failure{L"the loader does not report libraries"};
}

} // namespace filemanager
