#pragma once

#include <windows.h>
#include <objidl.h>

// The module's start and end in a host process. Called under the loader lock, so each function does as little as it
// can.
namespace tavi {

enum class HostKind { refused, toolOnly, fileManager };

// Returns the kind by the executable's name. Compares only as many characters as the known name has, so that
// "explorer.exe.old" is a file manager, too.
HostKind hostKindOf(const wchar_t* executablePath) noexcept;

void attachToFileManager(HINSTANCE instance, const wchar_t* hostPath);
// With `processEnds` the system frees everything, and only work that takes no lock of the process is done.
void detachFromFileManager(bool processEnds);

// Returns the shell's allocator while the module is attached to a file manager, else null. Not owned by the caller.
IMalloc* shellAllocator() noexcept;

// Asks both background threads to end, without waiting.
void requestThreadsStop() noexcept;
// Cancels that request, or starts the threads again that have ended: a host may go on using the module after
// DllCanUnloadNow allowed it to unload, and then neither detach nor attach happens.
void resumeThreads() noexcept;

} // namespace tavi
