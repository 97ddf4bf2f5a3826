#include "ui/MenuBitmap.h"

#include <atomic>
#include <memory>
#include <utility>

#include "core/Handles.h"
#include "core/Module.h"
#include "ui/ActivationScope.h"

namespace tavi {
namespace {

// The map from id to bitmap, in the order of the ids. It only grows until it is emptied, so it needs no lock even when
// two of the host's windows build their first menus at once.
struct CachedBitmap {
    UINT id;
    BitmapHandle bitmap;
    std::atomic<CachedBitmap*> next;
};
std::atomic<CachedBitmap*> cache{nullptr};

// The first entry whose id is not below the given one, and the link that leads to it.
std::pair<std::atomic<CachedBitmap*>*, CachedBitmap*> findPlace(UINT id) noexcept
{
    std::atomic<CachedBitmap*>* link = &cache;
    CachedBitmap* entry = *link;
    while (entry && entry->id < id) {
        link = &entry->next;
        entry = *link;
    }
    return {link, entry};
}

HBITMAP findBitmap(UINT id) noexcept
{
    const CachedBitmap* const entry = findPlace(id).second;
    return entry && entry->id == id ? entry->bitmap.get() : nullptr;
}

HBITMAP storeBitmap(UINT id, BitmapHandle bitmap)
{
    auto added = std::make_unique<CachedBitmap>();
    added->id = id;
    added->bitmap = std::move(bitmap);
    for (;;) {
        const auto [link, following] = findPlace(id);
        if (following && following->id == id)
            return following->bitmap.get();
        added->next = following;
        CachedBitmap* expected = following;
        if (link->compare_exchange_strong(expected, added.get()))
            return added.release()->bitmap.get();
    }
}

class SelectionScope {
  public:
    SelectionScope(HDC dc, HGDIOBJ object) noexcept : dc_(dc), previous_(SelectObject(dc, object)) {}
    ~SelectionScope()
    {
        if (previous_)
            SelectObject(dc_, previous_);
    }
    SelectionScope(const SelectionScope&) = delete;
    SelectionScope& operator=(const SelectionScope&) = delete;
    explicit operator bool() const noexcept
    {
        return previous_ != nullptr;
    }

  private:
    HDC dc_;
    HGDIOBJ previous_;
};

bool drawIcon(HDC dc, HBITMAP bitmap, HICON icon, int width, int height, COLORREF background)
{
    const SelectionScope selected(dc, bitmap);
    const BrushHandle brush(CreateSolidBrush(background));
    const RECT all{0, 0, width, height};
    return selected && brush && FillRect(dc, &all, brush.get()) != 0 &&
           DrawIconEx(dc, 0, 0, icon, width, height, 0, nullptr, DI_NORMAL);
}

} // namespace

HBITMAP menuBitmap(UINT resourceId, COLORREF background)
{
    if (const HBITMAP known = findBitmap(resourceId))
        return known;

    const ActivationScope activation;
    const int width = GetSystemMetrics(SM_CXMENUCHECK);
    const int height = GetSystemMetrics(SM_CYMENUCHECK);
    const IconHandle icon(static_cast<HICON>(
        LoadImageW(moduleInstance(), MAKEINTRESOURCEW(LOWORD(resourceId)), IMAGE_ICON, width, height, 0)));
    if (!icon)
        return nullptr;
    const ScreenDc screen(GetDC(nullptr));
    if (!screen)
        return nullptr;
    const MemoryDc memory(CreateCompatibleDC(screen.get()));
    BitmapHandle bitmap(CreateCompatibleBitmap(screen.get(), width, height));
    if (!memory || !bitmap || !drawIcon(memory.get(), bitmap.get(), icon.get(), width, height, background))
        return nullptr;
    return storeBitmap(resourceId, std::move(bitmap));
}

void freeMenuBitmaps() noexcept
{
    for (CachedBitmap* entry = cache.exchange(nullptr); entry;) {
        const std::unique_ptr<CachedBitmap> freed(entry);
        entry = entry->next;
    }
}

} // namespace tavi
