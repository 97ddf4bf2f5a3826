#include "ui/MenuBitmap.h"

#include "tests/support/Dialogs.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using MenuBitmapTest = test::UiTest;

TEST_F(MenuBitmapTest, KeepsTheIconOnItsFirstBackgroundUntilFreed)
{
    constexpr COLORREF kPlain = 0x202020;
    const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, kPlain);
    EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, 0x00FF00), bitmap);
    EXPECT_EQ(menuBitmap(136, 0), nullptr) << "no such icon";
    const MemoryDc dc(CreateCompatibleDC(nullptr));
    const HGDIOBJ before = SelectObject(dc.get(), bitmap);
    const int width = GetSystemMetrics(SM_CXMENUCHECK), size = width * GetSystemMetrics(SM_CYMENUCHECK);
    int bare = 0;
    for (int i = 0; i < size; ++i)
        bare += GetPixel(dc.get(), i % width, i / width) == kPlain ? 1 : 0;
    EXPECT_TRUE(bare > size / 5 && bare < size * 4 / 5) << bare << " pixels of background";
    SelectObject(dc.get(), before);
    freeMenuBitmaps();
    EXPECT_EQ(GetObjectType(bitmap), 0u);
}

} // namespace
} // namespace tavi
