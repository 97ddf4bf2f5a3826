#pragma once

#include <windows.h>

// The registry entries that make the file manager load the module. No message and no roll-back: a failing step ends the
// run.
namespace tavi {

// 0, or the raw error of the first step that failed.
LSTATUS registerServer();
LSTATUS unregisterServer();

// Deletes a key under an open parent with everything below it; 0 or the first error.
LSTATUS deleteKeyTree(HKEY parent, const wchar_t* name);

} // namespace tavi
