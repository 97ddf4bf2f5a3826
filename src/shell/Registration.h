#pragma once

#include <windows.h>

// The registry entries that make the file manager load the module. A failing step ends the run: nothing is rolled back
// or logged. Each function returns 0 or the system's code of the step that failed.
namespace tavi {

LSTATUS registerServer();
LSTATUS unregisterServer();

// Deletes a key below an open parent with everything below it.
LSTATUS deleteKeyTree(HKEY parent, const wchar_t* name);

} // namespace tavi
