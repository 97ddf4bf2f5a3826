#pragma once

#include <cstddef>

#include <windows.h>
#include <shlobj.h>

#include "ui/Selection.h"

// The shell object's menu operations on a captured selection. Each is called on the object's own thread; the caller is
// the boundary for exceptions.
namespace tavi {

// Inserts the separator and, if there is something to restore, the restore command. Returns the number of ids used.
UINT insertMenuItems(HMENU menu, UINT indexMenu, UINT idCmdFirst, UINT flags, const Selection& selection);

// The verb or help text of a command. `size` counts characters of the requested form.
HRESULT commandString(UINT_PTR offset, UINT type, LPSTR buffer, UINT size, const Selection& selection);

HRESULT invokeCommand(const CMINVOKECOMMANDINFO& info, const Selection& selection);

} // namespace tavi
