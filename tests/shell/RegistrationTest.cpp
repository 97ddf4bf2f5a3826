#include "shell/Registration.h"

#include <shlobj.h>

#include "tests/support/Dialogs.h"

// Takes the place of the import from the shell.
static int announcements = 0;
static void WINAPI countAnnouncement(LONG event, UINT flags, const void*, const void*)
{
    announcements += event == SHCNE_ASSOCCHANGED && flags == SHCNF_IDLIST;
}
#ifdef _WIN64
extern decltype(&SHChangeNotify) importedNotify asm("__imp_SHChangeNotify");
#else
extern decltype(&SHChangeNotify) importedNotify asm("__imp__SHChangeNotify@16");
#endif
decltype(&SHChangeNotify) importedNotify = countAnnouncement;

using namespace tavi;

namespace {

const wxString kOwnKey = L"HKEY_CURRENT_USER\\Software\\TaviTest", kClasses = kOwnKey + L"\\CLSID\\",
               kId = L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}", kMenus = L"\\shellex\\ContextMenuHandlers\\Tavi",
               kApproved = kOwnKey + L"\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved";
const wchar_t* const kKinds[] = {L"AllFilesystemObjects", L"Drive", L"Directory", L"Directory\\Background", L"Folder"};

// Returns what is registered. The texts are those that the packages write, whose test compares the two.
std::string registered()
{
    std::string found = wxRegKey(kClasses + kId + L"\\InProcServer32").Exists() ? "class " : "";
    for (const wchar_t* const kind : kKinds)
        found += wxRegKey(kOwnKey + L"\\" + kind + kMenus).Exists() ? "handler " : "";
    return found + (wxRegKey(kApproved).HasValue(kId) ? "approved" : "");
}

TEST(Registration, WritesTheClassAndItsHandlersAndDeletesTheClassOnly)
{
    setModuleInstance(GetModuleHandleW(nullptr));
    // An empty key becomes this process's HKEY_CLASSES_ROOT and HKEY_LOCAL_MACHINE.
    wxRegKey(kOwnKey).Create();
    RegistryKey own;
    RegOpenKeyW(HKEY_CURRENT_USER, L"Software\\TaviTest", own.out());
    for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
        EXPECT_EQ(RegOverridePredefKey(key, own.get()), ERROR_SUCCESS);
    EXPECT_EQ(registerServer(), ERROR_FILE_NOT_FOUND) << "without the approved list";
    const std::string handlers = "handler handler handler handler handler ";
    EXPECT_EQ(registered(), "class " + handlers);
    EXPECT_EQ(announcements, 0);
    wxRegKey(kApproved).Create();
    EXPECT_EQ(registerServer(), 0);
    EXPECT_EQ(registered(), "class " + handlers + "approved");
    EXPECT_EQ(announcements, 1);
    EXPECT_EQ(unregisterServer(), ERROR_FILE_NOT_FOUND) << "scripts delete the handlers and the approved value";
    EXPECT_EQ(registered(), handlers + "approved");
    // With every former key below the classes the run gets to the approved value.
    for (const wxString& key :
         {kId, L"*" + kMenus, wxString(L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi")})
        wxRegKey(kClasses + key).Create();
    for (const wchar_t* const kind : kKinds)
        wxRegKey(kClasses + kind + kMenus + L"\\a\\b").Create();
    EXPECT_EQ(announcements, 1);
    EXPECT_EQ(unregisterServer(), 0);
    EXPECT_EQ(announcements, 2);
    EXPECT_EQ(registered(), handlers);
    EXPECT_FALSE(wxRegKey(kClasses + kKinds[0] + kMenus).Exists());
    for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
        RegOverridePredefKey(key, nullptr);
    wxRegKey(kOwnKey).DeleteSelf();
}

} // namespace
