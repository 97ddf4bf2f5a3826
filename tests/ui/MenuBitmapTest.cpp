#include "ui/MenuBitmap.h"

#include <gtest/gtest.h>

#include "core/Handles.h"
#include "core/Module.h"
#include "ui/resource.h"

namespace tavi {
namespace {

TEST(MenuBitmap, IsTheIconOnTheFirstBackgroundUntilFreed)
{
    setModuleInstance(GetModuleHandleW(nullptr));
    for (const COLORREF plain : {0xF0F0F0ul, 0x202020ul}) {
        const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, plain);
        // Other ids, below and above, do not disturb it, nor does another colour.
        const HBITMAP others[] = {menuBitmap(TAVI_ICON_OVERLAY, 0), menuBitmap(TAVI_ICON_RESTORE, 0)};
        EXPECT_TRUE(others[0] && others[1] && others[0] != others[1]);
        EXPECT_EQ(menuBitmap(136, 0), nullptr);
        EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, 0x00FF00), bitmap);

        BITMAP shape{};
        GetObjectW(bitmap, sizeof(shape), &shape);
        EXPECT_EQ(shape.bmWidth, GetSystemMetrics(SM_CXMENUCHECK));
        EXPECT_EQ(shape.bmHeight, GetSystemMetrics(SM_CYMENUCHECK));
        // Enough of the icon is drawn, and enough of the background shows.
        const MemoryDc dc(CreateCompatibleDC(nullptr));
        const HGDIOBJ before = SelectObject(dc.get(), bitmap);
        int drawn = 0, bare = 0;
        for (int i = 0; i < shape.bmWidth * shape.bmHeight; ++i) {
            const COLORREF pixel = GetPixel(dc.get(), i % shape.bmWidth, i / shape.bmWidth);
            int distance = 0;
            for (const int shift : {0, 8, 16})
                distance += std::abs(int(pixel >> shift & 255) - int(plain >> shift & 255));
            bare += pixel == plain;
            drawn += distance > 150;
        }
        EXPECT_GT(std::min(drawn, bare), shape.bmWidth * shape.bmHeight / 5);
        SelectObject(dc.get(), before);
        freeMenuBitmaps();
        EXPECT_EQ(GetObjectType(bitmap), 0u);
    }
}

} // namespace
} // namespace tavi
