#pragma once

#include <string>
#include <vector>

// The catalogues of the module's texts, one resource for each language. wxWidgets holds the one in use, in which _()
// and wxPLURAL look up their texts; without one the texts are English.
namespace tavi {

// Loads the catalogue of the first of the user's display languages that has one or is English, unless that is done.
// The menu and the versions dialog, which precede every other text, call it first. Any thread. Without memory the texts
// are English until the next call.
void loadTranslations() noexcept;
// The same for these languages ("de-DE").
void loadTranslations(const std::vector<std::wstring>& languages);

// Returns whether a catalogue is loaded.
bool isTranslated() noexcept;
// Returns whether it is that of a language which is read from right to left.
bool isRightToLeft() noexcept;

// Frees the catalogue before the module is unloaded. No thread may look up a text any more.
void freeTranslations() noexcept;

} // namespace tavi
