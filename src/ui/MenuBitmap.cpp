#include "ui/MenuBitmap.h"

#include <map>
#include <mutex>
#include <utility>

#include "core/CriticalSection.h"
#include "core/Handles.h"
#include "core/Module.h"
#include "core/ScopeGuard.h"
#include "ui/ActivationScope.h"

namespace tavi {
namespace {

struct Cache {
    CriticalSection lock;
    // By resource id. No bitmap where one could not be made.
    std::map<UINT, BitmapHandle> bitmaps;
} cache;

bool drawIcon(HDC dc, HBITMAP bitmap, HICON icon, int width, int height, COLORREF background)
{
    const HGDIOBJ previous = SelectObject(dc, bitmap);
    const ScopeGuard deselect([&] { SelectObject(dc, previous); });
    const BrushHandle brush(CreateSolidBrush(background));
    const RECT all{0, 0, width, height};
    return previous && brush && FillRect(dc, &all, brush.get()) != 0 &&
           DrawIconEx(dc, 0, 0, icon, width, height, 0, nullptr, DI_NORMAL);
}

BitmapHandle makeBitmap(UINT resourceId, COLORREF background)
{
    const ActivationScope activation;
    const int width = GetSystemMetrics(SM_CXMENUCHECK);
    const int height = GetSystemMetrics(SM_CYMENUCHECK);
    const IconHandle icon(static_cast<HICON>(
        LoadImageW(moduleInstance(), MAKEINTRESOURCEW(LOWORD(resourceId)), IMAGE_ICON, width, height, 0)));
    const ScreenDc screen(GetDC(nullptr));
    if (!icon || !screen)
        return BitmapHandle();
    const MemoryDc memory(CreateCompatibleDC(screen.get()));
    BitmapHandle bitmap(CreateCompatibleBitmap(screen.get(), width, height));
    if (!memory || !bitmap || !drawIcon(memory.get(), bitmap.get(), icon.get(), width, height, background))
        return BitmapHandle();
    return bitmap;
}

} // namespace

HBITMAP menuBitmap(UINT resourceId, COLORREF background)
{
    const std::lock_guard guard(cache.lock);
    BitmapHandle& bitmap = cache.bitmaps[resourceId];
    if (!bitmap)
        bitmap = makeBitmap(resourceId, background);
    return bitmap.get();
}

void freeMenuBitmaps() noexcept
{
    const std::lock_guard guard(cache.lock);
    cache.bitmaps.clear();
}

} // namespace tavi
