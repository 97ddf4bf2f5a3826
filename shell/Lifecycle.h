#pragma once

#include <windows.h>

#include "core/Module.h"

// The module's start and end in a host process. Called under the loader lock, which is why each of these does no more
// than it must.
namespace tavi {

enum class HostKind { refused, toolOnly, fileManager };

// By the host's executable name; a prefix comparison, so that "explorer.exe.old" passes as well.
HostKind hostKindOf(const wchar_t* executablePath) noexcept;

void attachToFileManager(HINSTANCE instance, const wchar_t* hostPath);
// `processEnds`: nothing is unloaded, so what the system takes back by itself may stay.
void detachFromFileManager(bool processEnds);

// The status listener's thread.
void StartStatusThread() noexcept;
// Gives the thread half a second, then terminates it.
void StopStatusThread() noexcept;

// Asks both background threads to end, without waiting.
void requestThreadsStop() noexcept;
// Starts them again where they were asked to end and the module is used after all: the host may come back before it, or
// the last of the threads, has let go of the mapping. Then nothing detaches and nothing attaches.
void resumeThreads() noexcept;

} // namespace tavi
