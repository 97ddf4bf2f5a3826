#pragma once

#include <map>
#include <string>

#include <windows.h>
#include <tlhelp32.h>
#include <winternl.h>

#include "core/Handles.h"

namespace tavi::test {

// Threads of this process.
inline std::size_t countThreads()
{
    std::size_t count = 0;
    const KernelHandle snapshot(CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0));
    THREADENTRY32 entry{};
    entry.dwSize = sizeof(entry);
    for (BOOL more = Thread32First(snapshot.get(), &entry); more; more = Thread32Next(snapshot.get(), &entry))
        count += entry.th32OwnerProcessID == GetCurrentProcessId() ? 1u : 0u;
    return count;
}

using Counts = std::map<std::wstring, std::size_t>;

// Counts this process's handles by the type of their object, its GDI objects and its threads. The system's own counters
// return 0 under Wine 8, so each possible handle is tried and the process's table of GDI objects is read.
inline Counts countNow()
{
    Counts counts{{L"thread", countThreads()}};
    for (ULONG_PTR value = 4; value < 0x10000; value += 4) {
        alignas(UNICODE_STRING) BYTE type[256];
        if (NT_SUCCESS(
                NtQueryObject(reinterpret_cast<HANDLE>(value), ObjectTypeInformation, type, sizeof(type), nullptr)))
            ++counts[L"handle of " + std::wstring(reinterpret_cast<const UNICODE_STRING*>(type)->Buffer)];
    }
    PROCESS_BASIC_INFORMATION process{};
    NtQueryInformationProcess(GetCurrentProcess(), ProcessBasicInformation, &process, sizeof(process), nullptr);
    const auto* const peb = reinterpret_cast<const BYTE*>(process.PebBaseAddress);
    const auto* const table = *reinterpret_cast<const BYTE* const*>(peb + (sizeof(void*) == 4 ? 0x94 : 0xF8));
    for (std::size_t entry = 0; entry < 4096; ++entry) // of 24 bytes, of which byte 14 is the type
        counts[L"GDI object"] += table[24 * entry + 14] != 0 ? 1u : 0u;
    return counts;
}

} // namespace tavi::test
