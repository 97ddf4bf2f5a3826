#pragma once

#include <windows.h>

namespace tavi {

// Returns the icon resource as a bitmap of the menu's check-mark size, or null when it cannot be made. The cache owns
// the bitmap until freeMenuBitmaps, in the background colour of the first call for this id. Any thread.
HBITMAP menuBitmap(UINT resourceId, COLORREF background);

// Deletes every bitmap. Called at unload, when the module has no menu left.
void freeMenuBitmaps() noexcept;

} // namespace tavi
