#include "ui/MenuBitmap.h"

#include <algorithm>
#include <vector>

#include <gtest/gtest.h>

#include "core/Handles.h"
#include "core/Module.h"
#include "ui/resource.h"

namespace tavi {
namespace {

// The bitmap's pixels as 0x00RRGGBB.
std::vector<DWORD> pixels(HBITMAP bitmap, SIZE& size)
{
    BITMAP shape{};
    GetObjectW(bitmap, sizeof(shape), &shape);
    size = {shape.bmWidth, shape.bmHeight};
    BITMAPINFO info{};
    info.bmiHeader = {sizeof(BITMAPINFOHEADER), shape.bmWidth, -shape.bmHeight, 1, 32, BI_RGB, 0, 0, 0, 0, 0};
    std::vector<DWORD> result(static_cast<std::size_t>(shape.bmWidth * shape.bmHeight));
    const MemoryDc dc(CreateCompatibleDC(nullptr));
    GetDIBits(dc.get(), bitmap, 0, static_cast<UINT>(shape.bmHeight), result.data(), &info, DIB_RGB_COLORS);
    for (DWORD& pixel : result)
        pixel &= 0xFFFFFF;
    return result;
}

class MenuBitmapTest : public testing::Test {
  protected:
    void SetUp() override
    {
        setModuleInstance(GetModuleHandleW(nullptr));
    }
    void TearDown() override
    {
        freeMenuBitmaps();
    }
};

TEST_F(MenuBitmapTest, IsTheIconOnTheBackground)
{
    for (const COLORREF background : {RGB(240, 240, 240), RGB(32, 32, 33)}) {
        SIZE size;
        const std::vector<DWORD> image = pixels(menuBitmap(TAVI_ICON_MENU, background), size);
        EXPECT_EQ(size.cx, GetSystemMetrics(SM_CXMENUCHECK));
        EXPECT_EQ(size.cy, GetSystemMetrics(SM_CYMENUCHECK));
        const DWORD plain =
            static_cast<DWORD>(GetRValue(background) << 16 | GetGValue(background) << 8 | GetBValue(background));
        // Enough of the icon is drawn, and enough of the background shows.
        const auto drawn = static_cast<std::size_t>(std::count_if(image.begin(), image.end(), [&](DWORD pixel) {
            const auto distance = [&](int shift) {
                return std::abs(int(pixel >> shift & 255) - int(plain >> shift & 255));
            };
            return distance(0) + distance(8) + distance(16) > 150;
        }));
        EXPECT_GT(drawn, image.size() / 5);
        EXPECT_GT(std::count(image.begin(), image.end(), plain), static_cast<std::ptrdiff_t>(image.size() / 5));
        freeMenuBitmaps();
    }
}

TEST_F(MenuBitmapTest, KeepsTheFirstColourUntilFreed)
{
    const HBITMAP first = menuBitmap(TAVI_ICON_MENU, RGB(255, 0, 0));
    SIZE size;
    const std::vector<DWORD> image = pixels(first, size);
    // Other ids, below and above, do not disturb it.
    const HBITMAP others[] = {menuBitmap(TAVI_ICON_OVERLAY, 0), menuBitmap(TAVI_ICON_RESTORE, 0)};
    EXPECT_TRUE(others[0] && others[1] && others[0] != others[1]);
    EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, RGB(0, 255, 0)), first);
    EXPECT_EQ(pixels(first, size), image);
    EXPECT_EQ(menuBitmap(136, 0), nullptr);
    freeMenuBitmaps();
    EXPECT_EQ(GetObjectType(first), 0u);
    EXPECT_NE(pixels(menuBitmap(TAVI_ICON_MENU, RGB(0, 255, 0)), size), image);

    // Nothing is left behind: new objects still get early places in the system's table.
    const auto highestPlace = [] {
        std::vector<BrushHandle> objects;
        int place = 0;
        for (int i = 0; i < 300; ++i) {
            objects.emplace_back(CreateSolidBrush(1));
            place = std::max<int>(place, LOWORD(reinterpret_cast<UINT_PTR>(objects.back().get())));
        }
        return place;
    };
    const int before = highestPlace();
    for (int i = 0; i < 600; ++i) {
        freeMenuBitmaps();
        menuBitmap(TAVI_ICON_MENU, 0);
    }
    EXPECT_LT(highestPlace(), before + 100);
}

} // namespace
} // namespace tavi
