#pragma once

#include <windows.h>
#include <prsht.h>

#include "manifest/Manifest.h"
#include "ui/Selection.h"

namespace tavi {

// Adds a page with the versions of the selection to a property sheet, if a selected file is backed up. The sheet frees
// the page; if `addPage` refuses the page, it is freed here. It counts as an object of the module until then, and until
// the last frame of a box that it has opened has returned. Its Cancel button closes the sheet, Restore and Copy To do
// not.
void addPropertyPage(const Selection& selection, ManifestRef manifest, LPFNADDPROPSHEETPAGE addPage, LPARAM parameter);

} // namespace tavi
