#pragma once

#include <windows.h>
#include <prsht.h>

#include "manifest/Manifest.h"
#include "ui/Selection.h"

namespace tavi {

// Offers the versions of the selection as a page of a property sheet, if a selected file is backed up. The page takes
// its own reference to the manifest and is freed by the sheet, or here when `addPage` refuses it; the module counts it
// until then, and until the last frame of a box that it has opened has returned. Its Cancel button closes the sheet;
// after Restore and Copy To the sheet stays as it is.
void addPropertyPage(const Selection& selection, ManifestRef manifest, LPFNADDPROPSHEETPAGE addPage, LPARAM parameter);

} // namespace tavi
