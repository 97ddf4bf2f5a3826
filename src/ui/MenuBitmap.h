#pragma once

#include <windows.h>

namespace tavi {

// The icon resource as a bitmap of the menu's check-mark size on the given background, or null when it cannot be made.
// The cache owns the bitmap and keeps the first colour asked for under an id until freeMenuBitmaps.
HBITMAP menuBitmap(UINT resourceId, COLORREF background);

// Deletes every bitmap. For module unload, when no menu of ours is left.
void freeMenuBitmaps() noexcept;

} // namespace tavi
