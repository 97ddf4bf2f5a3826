#include "ui/MenuBitmap.h"

#include "core/Handles.h"
#include "tests/support/Dialogs.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using MenuBitmapTest = test::UiTest;

TEST_F(MenuBitmapTest, KeepsTheIconOnItsFirstBackgroundUntilFreed)
{
    for (const COLORREF plain : {0xF0F0F0ul, 0x202020ul}) {
        const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, plain);
        EXPECT_NE(menuBitmap(TAVI_ICON_OVERLAY, 0), menuBitmap(TAVI_ICON_RESTORE, 0));
        EXPECT_EQ(menuBitmap(136, 0), nullptr) << "no such icon";
        EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, 0x00FF00), bitmap);
        const MemoryDc dc(CreateCompatibleDC(nullptr));
        const HGDIOBJ before = SelectObject(dc.get(), bitmap);
        const int width = GetSystemMetrics(SM_CXMENUCHECK), size = width * GetSystemMetrics(SM_CYMENUCHECK);
        int bare = 0;
        for (int i = 0; i < size; ++i)
            bare += GetPixel(dc.get(), i % width, i / width) == plain ? 1 : 0;
        EXPECT_TRUE(bare > size / 5 && bare < size * 4 / 5) << bare << " pixels of background";
        SelectObject(dc.get(), before);
        freeMenuBitmaps();
        EXPECT_EQ(GetObjectType(bitmap), 0u);
    }
}

} // namespace
} // namespace tavi
