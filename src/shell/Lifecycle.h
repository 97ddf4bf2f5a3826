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
// With `processEnds` nothing is unloaded, and only what needs no lock of the process is done.
void detachFromFileManager(bool processEnds);

// The status listener's thread.
void startStatusThread() noexcept;
// Gives the thread half a second, then terminates it.
void stopStatusThread() noexcept;

// Asks both background threads to end, without waiting.
void requestThreadsStop() noexcept;
// Withdraws the request, or starts again what has ended: the host may use the module after it was allowed to unload it,
// and then neither detach nor attach happens.
void resumeThreads() noexcept;

} // namespace tavi
