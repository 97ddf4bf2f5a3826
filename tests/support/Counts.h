#pragma once

#include <array>
#include <cstdint>

#include <windows.h>
#include <tlhelp32.h>
#include <winternl.h>

namespace tavi::test {

// Handles, GDI objects and threads of this process. The system's own counters answer 0 under Wine 8: each handle that
// can be is tried, and the table of GDI objects is read where the process has it.
inline std::array<std::size_t, 3> countNow()
{
    struct GdiEntry {
        std::uint64_t object;
        DWORD owner;
        WORD unique;
        BYTE type, flags;
        std::uint64_t user;
    };
    std::array<std::size_t, 3> counts{};
    DWORD flags = 0;
    for (ULONG_PTR value = 4; value < 0x10000; value += 4)
        counts[0] += GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1u : 0u;
    PROCESS_BASIC_INFORMATION process{};
    NtQueryInformationProcess(GetCurrentProcess(), ProcessBasicInformation, &process, sizeof(process), nullptr);
    const auto* const peb = reinterpret_cast<const BYTE*>(process.PebBaseAddress);
    const auto* const table = *reinterpret_cast<const GdiEntry* const*>(peb + (sizeof(void*) == 4 ? 0x94 : 0xF8));
    counts[1] = static_cast<std::size_t>(
        std::count_if(table, table + 4096, [](const GdiEntry& entry) { return entry.type != 0; }));
    const KernelHandle snapshot(CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0));
    THREADENTRY32 entry{};
    entry.dwSize = sizeof(entry);
    for (BOOL more = Thread32First(snapshot.get(), &entry); more; more = Thread32Next(snapshot.get(), &entry))
        counts[2] += entry.th32OwnerProcessID == GetCurrentProcessId() ? 1u : 0u;
    return counts;
}

} // namespace tavi::test
