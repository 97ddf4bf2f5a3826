#include "ui/DialogLayout.h"

#include <algorithm>
#include <cstring>

#include "core/Module.h"
#include "ui/Translations.h"

namespace tavi {
namespace {

// In dialog units.
constexpr int kLabelGap = 3;
// The third field of an extended template is its extended window style.
constexpr std::size_t kExtendedStyleField = 2;

// A control's place in its dialog, which the destructor applies.
class Place : public RECT {
  public:
    Place(HWND dialog, int id) : RECT(), control_(GetDlgItem(dialog, id))
    {
        GetWindowRect(control_, this);
        MapWindowPoints(nullptr, dialog, reinterpret_cast<POINT*>(static_cast<RECT*>(this)), 2);
    }
    ~Place()
    {
        SetWindowPos(control_, nullptr, left, top, right - left, bottom - top, SWP_NOZORDER | SWP_NOACTIVATE);
    }
    Place(const Place&) = delete;
    Place& operator=(const Place&) = delete;
    // Returns by how much the width must grow.
    LONG lacks(LONG width) const
    {
        return std::max(LONG{0}, width - (right - left));
    }

  private:
    HWND control_;
};

wxString textOf(HWND dialog, int id)
{
    const HWND control = GetDlgItem(dialog, id);
    std::vector<wchar_t> text(static_cast<std::size_t>(GetWindowTextLengthW(control)) + 1);
    GetWindowTextW(control, text.data(), static_cast<int>(text.size()));
    return wxString(text.data());
}

} // namespace

std::vector<std::uint32_t> dialogTemplate(UINT id)
{
    const HINSTANCE module = moduleInstance();
    const HRSRC resource = FindResourceW(module, MAKEINTRESOURCEW(id), RT_DIALOG);
    const HGLOBAL loaded = resource ? LoadResource(module, resource) : nullptr;
    if (!loaded)
        return {};
    const DWORD size = SizeofResource(module, resource);
    std::vector<std::uint32_t> copy(size / sizeof(std::uint32_t) + 1);
    std::memcpy(copy.data(), LockResource(loaded), size);
    if (isRightToLeft())
        copy[kExtendedStyleField] |= WS_EX_LAYOUTRTL;
    return copy;
}

TextRuler::TextRuler(HWND control) : dc_(GetDC(nullptr))
{
    const auto font = reinterpret_cast<HGDIOBJ>(SendMessageW(control, WM_GETFONT, 0, 0));
    previous_ = font ? SelectObject(dc_.get(), font) : nullptr;
}

TextRuler::~TextRuler()
{
    if (previous_)
        SelectObject(dc_.get(), previous_);
}

SIZE TextRuler::measure(const wxString& text, LONG width, UINT format) const
{
    RECT needed{0, 0, width, 0};
    DrawTextW(dc_.get(), text.wc_str(), -1, &needed, DT_CALCRECT | format | (width > 0 ? DT_WORDBREAK : 0u));
    return {needed.right, needed.bottom};
}

void fitButtons(HWND dialog, std::initializer_list<int> ids)
{
    LONG shift = 0;
    for (const int id : ids) {
        Place button(dialog, id);
        const TextRuler ruler(GetDlgItem(dialog, id));
        // Beside the text, half of the height on either side.
        const LONG grows = button.lacks(ruler.measure(textOf(dialog, id), 0, 0).cx + button.bottom - button.top);
        button.right -= shift;
        shift += grows;
        button.left -= shift;
    }
}

void fitLabel(HWND dialog, int id, std::initializer_list<wxString> texts)
{
    Place label(dialog, id);
    const TextRuler ruler(GetDlgItem(dialog, id));
    for (const wxString& text : texts)
        label.left -= label.lacks(ruler.measure(text, 0, DT_NOPREFIX).cx);
}

void extendLabel(HWND dialog, int id, int neighbour)
{
    RECT gap{0, 0, kLabelGap, 0};
    MapDialogRect(dialog, &gap);
    Place label(dialog, id);
    label.right = Place(dialog, neighbour).left - gap.right;
}

void fitMessage(HWND dialog, int message, int label, int list)
{
    Place text(dialog, message), below(dialog, label), rows(dialog, list);
    const TextRuler ruler(GetDlgItem(dialog, message));
    const LONG height = ruler.measure(textOf(dialog, message), text.right - text.left, DT_NOPREFIX).cy;
    const LONG grows = std::max(LONG{0}, height - (text.bottom - text.top));
    text.bottom += grows;
    OffsetRect(&below, 0, grows);
    rows.top += grows;
}

} // namespace tavi
