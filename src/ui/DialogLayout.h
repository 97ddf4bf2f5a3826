#pragma once

#include <cstdint>
#include <initializer_list>
#include <vector>

#include <windows.h>
#include <wx/string.h>

#include "core/Handles.h"

// The layout of the module's dialogs. The templates fit the English texts; these functions make room for those of other
// languages, at the expense of the neighbours. Called on the window's thread.
namespace tavi {

// Returns a copy of the module's dialog template, or nothing if it cannot be had. Its windows are mirrored in a
// language that is read from right to left.
std::vector<std::uint32_t> dialogTemplate(UINT id);

// Measures texts in the font of a control.
class TextRuler {
  public:
    explicit TextRuler(HWND control);
    ~TextRuler();
    TextRuler(const TextRuler&) = delete;
    TextRuler& operator=(const TextRuler&) = delete;

    // Returns the size of the text, broken into lines of at most `width` pixels unless that is 0. `format` is for
    // DrawText.
    SIZE measure(const wxString& text, LONG width, UINT format) const;

  private:
    ScreenDc dc_;
    HGDIOBJ previous_;
};

// Widens buttons in a row to the left, so that their texts fit; the ids are in order from the right.
void fitButtons(HWND dialog, std::initializer_list<int> ids);

// Widens a label to the left, so that each of the texts fits.
void fitLabel(HWND dialog, int id, std::initializer_list<wxString> texts);

// Lets a label end in front of its right neighbour.
void extendLabel(HWND dialog, int id, int neighbour);

// Grows a message downwards until its text fits. Moves the label below by as much, and the upper edge of the list below
// that.
void fitMessage(HWND dialog, int message, int label, int list);

} // namespace tavi
