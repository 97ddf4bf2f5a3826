#include "shell/Registration.h"

#include <map>

#include <shlobj.h>
#include <wx/stdpaths.h>

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
using namespace tavi::test;

namespace {

const wxString kOwnKey = L"HKEY_CURRENT_USER\\Software\\TaviTest", kClasses = L"\\CLSID\\",
               kId = L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}", kShown = L"Tavi Remote Backup Shell Extension",
               kMenus = L"\\shellex\\ContextMenuHandlers\\Tavi",
               kApproved = L"\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved\\";

using Values = std::map<wxString, wxString>;

// While it lives, an empty key is this process's HKEY_CLASSES_ROOT and HKEY_LOCAL_MACHINE.
struct RegistrationTest : testing::Test {
    RegistrationTest()
    {
        setModuleInstance(GetModuleHandleW(nullptr));
        RegistryKey own;
        RegCreateKeyW(HKEY_CURRENT_USER, L"Software\\TaviTest", own.out());
        for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
            EXPECT_EQ(RegOverridePredefKey(key, own.get()), ERROR_SUCCESS);
        for (const wchar_t* kind :
             {L"AllFilesystemObjects", L"Drive", L"Directory", L"Directory\\Background", L"Folder"})
            handlers[L"\\" + (kind + kMenus) + L"\\"] = kId;
    }
    ~RegistrationTest() override
    {
        wxRegKey(kOwnKey).DeleteSelf();
        for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
            RegOverridePredefKey(key, nullptr);
    }
    // Returns the texts below the key by their paths, but not those that the shell writes below CurrentVersion.
    static Values stored(const wxString& path = kOwnKey)
    {
        Values all;
        wxRegKey key(path);
        wxString name;
        long at = 0;
        const bool isOfTheShell = path.Contains(L"CurrentVersion") && !path.Contains(L"Approved");
        for (bool more = key.GetFirstValue(name, at); more && !isOfTheShell; more = key.GetNextValue(name, at))
            EXPECT_TRUE(key.QueryValue(name, all[path.substr(kOwnKey.length()) + L"\\" + name]));
        for (bool more = key.GetFirstKey(name, at); more; more = key.GetNextKey(name, at))
            all.merge(stored(path + L"\\" + name));
        return all;
    }
    Values handlers;
};

TEST_F(RegistrationTest, WritesTheClassAndItsHandlersAndDeletesTheClassOnly)
{
    Values expected = handlers;
    expected[kClasses + kId + L"\\"] = kShown;
    expected[kClasses + kId + L"\\InProcServer32\\"] = wxStandardPaths::Get().GetExecutablePath();
    expected[kClasses + kId + L"\\InProcServer32\\ThreadingModel"] = L"Apartment";
    EXPECT_EQ(registerServer(), ERROR_FILE_NOT_FOUND) << "without the approved list";
    EXPECT_EQ(stored(), expected);
    EXPECT_EQ(announcements, 0);
    wxRegKey(kOwnKey + kApproved).Create();
    Values left = handlers;
    left[kApproved + kId] = expected[kApproved + kId] = kShown;
    EXPECT_EQ(registerServer(), 0);
    EXPECT_EQ(stored(), expected);
    EXPECT_EQ(announcements, 1);
    EXPECT_EQ(unregisterServer(), ERROR_FILE_NOT_FOUND) << "scripts delete the handlers and the approved value";
    EXPECT_EQ(stored(), left);
    // With every former key below the classes the run gets to the approved value.
    for (const wxString& key :
         {kId, L"*" + kMenus, wxString(L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi")})
        wxRegKey(kOwnKey + kClasses + key).Create();
    for (const auto& [path, id] : handlers)
        wxRegKey(kOwnKey + L"\\CLSID" + path + L"a\\b").Create();
    EXPECT_EQ(announcements, 1);
    EXPECT_EQ(unregisterServer(), 0);
    EXPECT_EQ(announcements, 2);
    EXPECT_EQ(stored(), handlers);
}

} // namespace
