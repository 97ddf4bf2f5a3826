#include "shell/Registration.h"

#include <map>

#include "tests/shell/LoadedModule.h"

namespace tavi {
namespace {

using namespace test;

const wxString kOwnKey = L"HKEY_CURRENT_USER\\Software\\TaviTest";

// While it lives, an empty key is this process's HKEY_CLASSES_ROOT and HKEY_LOCAL_MACHINE.
struct RegistrationTest : HostTest {
    LoadedModule module; // before the redirection, because a load without an installed service waits half a minute

    RegistrationTest()
    {
        redirectTo(RegistryKey());
        RegistryKey own;
        RegCreateKeyW(HKEY_CURRENT_USER, L"Software\\TaviTest", own.out());
        redirectTo(own);
    }
    ~RegistrationTest() override
    {
        redirectTo(RegistryKey());
    }
    static void redirectTo(const RegistryKey& own)
    {
        if (!own)
            wxRegKey(kOwnKey).DeleteSelf();
        for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
            EXPECT_EQ(RegOverridePredefKey(key, own.get()), ERROR_SUCCESS);
    }
};

using Values = std::map<wxString, wxString>;

// Adds the values below a key by their paths, but none of those that the shell's own functions write below
// CurrentVersion at any time.
void addValues(const wxString& path, Values& all)
{
    wxRegKey key(path);
    wxString name, text;
    long at = 0;
    const bool isOfTheShell = path.Contains(L"CurrentVersion") && !path.Contains(L"Approved");
    for (bool more = key.GetFirstValue(name, at); more && !isOfTheShell; more = key.GetNextValue(name, at)) {
        EXPECT_TRUE(key.GetValueType(name) == wxRegKey::Type_String && key.QueryValue(name, text)) << path << name;
        all[path.substr(kOwnKey.length()) + L"\\" + name] = text;
    }
    for (bool more = key.GetFirstKey(name, at); more; more = key.GetNextKey(name, at))
        addValues(path + L"\\" + name, all);
}

Values storedValues()
{
    Values all;
    addValues(kOwnKey, all);
    return all;
}

const wxString kId = L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}", kShown = L"Tavi Remote Backup Shell Extension",
               kClasses = L"\\CLSID\\", kMenus = L"\\shellex\\ContextMenuHandlers\\Tavi",
               kApproved = L"\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved\\";

Values handlerValues()
{
    Values values;
    for (const wchar_t* kind : {L"AllFilesystemObjects", L"Drive", L"Directory", L"Directory\\Background", L"Folder"})
        values[L"\\" + (kind + kMenus) + L"\\"] = kId;
    return values;
}

TEST_F(RegistrationTest, WritesTheClassAndItsHandlersAndNeedsTheApprovedList)
{
    Values expected = handlerValues();
    expected[kClasses + kId + L"\\"] = kShown;
    expected[kClasses + kId + L"\\InProcServer32\\"] = modulePath();
    expected[kClasses + kId + L"\\InProcServer32\\ThreadingModel"] = L"Apartment";
    EXPECT_EQ(module.registerServer(), ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(storedValues(), expected);
    wxRegKey(kOwnKey + kApproved).Create();
    expected[kApproved + kId] = kShown;
    EXPECT_EQ(module.registerServer(), 0);
    EXPECT_EQ(storedValues(), expected);
}

// Scripts delete the handlers and the approved value themselves.
TEST_F(RegistrationTest, DeletesTheClassOnlyUnlessEveryFormerKeyIsBelowTheClasses)
{
    wxRegKey(kOwnKey + kApproved).Create();
    EXPECT_EQ(module.registerServer(), 0);
    Values left = handlerValues();
    left[kApproved + kId] = kShown;
    EXPECT_EQ(module.unregisterServer(), ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(storedValues(), left);

    std::vector<wxString> keys{kId, L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi"};
    for (const wchar_t* kind :
         {L"AllFileSystemObjects", L"Directory\\Background", L"Directory", L"Drive", L"Folder", L"*"})
        keys.push_back(kind + kMenus);
    for (const wxString& key : keys)
        wxRegKey(kOwnKey + kClasses + key + L"\\a\\b").Create();
    EXPECT_EQ(module.unregisterServer(), 0);
    EXPECT_EQ(storedValues(), handlerValues());
    for (const wxString& key : keys)
        EXPECT_FALSE(wxRegKey(kOwnKey + kClasses + key).Exists()) << key;
}

} // namespace
} // namespace tavi
