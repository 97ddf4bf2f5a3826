#include <cstdio>
#include <cstring>
#include <string>

#include <windows.h>
#include <prsht.h>

#include "manifest/CurrentManifest.h"
#include "exclusions/Graylist.h"
#include "core/Module.h"
#include "core/Utf8.h"
#include "ui/PropertyPage.h"

namespace {

using namespace tavi;

const char* meaning(FolderState state)
{
    static const char* const meanings[] = {"backed up",
                                           "left out, but not what is listed below",
                                           "backed up, some below left out",
                                           "left out, some below backed up",
                                           "backed up, nearly all below left out",
                                           "left out, some below backed up",
                                           "backed up, all below left out",
                                           "left out",
                                           "backed up"};
    const auto number = static_cast<std::uint32_t>(state);
    return number < 9 ? meanings[number] : "unknown";
}

int printExclusions()
{
    const PathTree* const tree = getGraylist(true);
    std::printf("state  path, and what becomes of it\n");
    tree->forEach([](const wxString& path, FolderState state) {
        std::printf("  %u    %s: %s\n", static_cast<unsigned>(state), toUtf8(view(path)).c_str(), meaning(state));
    });
    tree->Release();
    return 0;
}

int explain(const wxString& path)
{
    const PathTree* const tree = getGraylist(true);
    const FolderState state = tree->lookup(view(path));
    std::printf("%s: %u, %s\n", toUtf8(view(path)).c_str(), static_cast<unsigned>(state), meaning(state));
    tree->Release();
    return 0;
}

struct Pages {
    HPROPSHEETPAGE handles[2];
    UINT count;
};

BOOL CALLBACK keepPage(HPROPSHEETPAGE page, LPARAM pages)
{
    auto& kept = *reinterpret_cast<Pages*>(pages);
    kept.handles[kept.count++] = page;
    return TRUE;
}

int showPage(const wxString& path)
{
    ManifestRef manifest;
    for (int waited = 0; !(manifest = getCurrentManifest()) && waited < 500; ++waited)
        Sleep(20);
    Pages pages{};
    Selection selection{};
    selection.paths = {path};
    selection.restoreMode = 1;
    addPropertyPage(selection, manifest, keepPage, reinterpret_cast<LPARAM>(&pages));
    if (pages.count == 0) {
        std::fprintf(stderr, "nothing of this is backed up\n");
        return 1;
    }
    const std::wstring caption = path.AfterLast(L'\\').ToStdWstring() + L" Properties";
    PROPSHEETHEADERW sheet{};
    sheet.dwSize = sizeof(sheet);
    sheet.dwFlags = PSH_NOAPPLYNOW;
    sheet.pszCaption = caption.c_str();
    sheet.nPages = pages.count;
    sheet.phpage = pages.handles;
    return PropertySheetW(&sheet) < 0 ? 1 : 0;
}

} // namespace

int wmain(int count, wchar_t** words)
{
    setModuleInstance(GetModuleHandleW(nullptr));
    const std::wstring command = count > 1 ? words[1] : L"";
    if (command == L"exclusions" && count == 2)
        return printExclusions();
    if (command == L"exclusions" && count == 3)
        return explain(words[2]);
    if (command == L"page" && count == 3)
        return showPage(words[2]);
    std::fprintf(stderr, "tavi_inspect exclusions         the places that a backup leaves out by default\n"
                         "tavi_inspect exclusions PATH    whether a path is one of them\n"
                         "tavi_inspect page FILE          the property page of a file's versions\n");
    return 1;
}
