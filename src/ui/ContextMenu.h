#pragma once

#include <cstddef>

#include <windows.h>
#include <shlobj.h>

#include "ui/Selection.h"

// The menu operations of the shell object on its captured selection. Called on the object's thread; the caller catches
// exceptions.
namespace tavi {

// Inserts a separator and, if the selection has versions, the restore command. Returns the number of ids used.
UINT insertMenuItems(HMENU menu, UINT indexMenu, UINT idCmdFirst, UINT flags, const Selection& selection);

// Copies the verb or help text of a command. `size` counts characters of the requested form.
HRESULT commandString(UINT_PTR offset, UINT type, LPSTR buffer, UINT size, const Selection& selection);

HRESULT invokeCommand(const CMINVOKECOMMANDINFO& info, const Selection& selection);

} // namespace tavi
