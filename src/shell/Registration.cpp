#include "shell/Registration.h"

#include <iterator>
#include <string>

#include <shlobj.h>

#include "core/Handles.h"
#include "core/Module.h"
#include "shell/ShellExt.h"

namespace tavi {
namespace {

const wchar_t kDisplayName[] = L"Tavi Remote Backup Shell Extension";
const wchar_t kApprovedKey[] = L"Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved";
constexpr REGSAM kReadWrite = KEY_READ | KEY_WRITE;
// Windows' limit for the name of a key, with its terminator.
constexpr DWORD kKeyNameChars = 256;

const wchar_t* const kHandlerKeys[] = {
    L"AllFilesystemObjects\\shellex\\ContextMenuHandlers\\Tavi",
    L"Drive\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\Background\\shellex\\ContextMenuHandlers\\Tavi",
    L"Folder\\shellex\\ContextMenuHandlers\\Tavi",
};

// Deleted after the class key and, like it, below the CLSID key. There is none of them there, so the run ends with
// ERROR_FILE_NOT_FOUND and the handler keys and the approved value stay: installers delete those themselves and expect
// that code.
const wchar_t* const kFormerKeys[] = {
    L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi",
    L"AllFileSystemObjects\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\Background\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\shellex\\ContextMenuHandlers\\Tavi",
    L"Drive\\shellex\\ContextMenuHandlers\\Tavi",
    L"Folder\\shellex\\ContextMenuHandlers\\Tavi",
    L"*\\shellex\\ContextMenuHandlers\\Tavi",
};

// Returns the class id as the registry has it: in braces and, since scripts compare it, in lower case.
std::wstring classIdText()
{
    wchar_t text[sizeof("{00000000-0000-0000-0000-000000000000}")] = L"";
    StringFromGUID2(ShellExt::kClassId, text, static_cast<int>(std::size(text)));
    return CharLowerW(text);
}

bool isNtFamily()
{
    return (GetVersion() & 0x80000000u) == 0;
}

LSTATUS setText(HKEY key, const wchar_t* valueName, const std::wstring& text)
{
    const std::size_t bytes = (text.length() + 1) * sizeof(wchar_t);
    return RegSetValueExW(key, valueName, 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()),
                          static_cast<DWORD>(bytes));
}

LSTATUS createKey(HKEY parent, const std::wstring& name, RegistryKey& key)
{
    return RegCreateKeyExW(parent, name.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, kReadWrite, nullptr, key.out(),
                           nullptr);
}

LSTATUS writeClassKey(const wchar_t* modulePath)
{
    RegistryKey classKey;
    LSTATUS status = createKey(HKEY_CLASSES_ROOT, L"CLSID\\" + classIdText(), classKey);
    if (status == ERROR_SUCCESS)
        status = setText(classKey.get(), nullptr, kDisplayName);
    RegistryKey serverKey;
    if (status == ERROR_SUCCESS)
        status = createKey(classKey.get(), L"InProcServer32", serverKey);
    if (status == ERROR_SUCCESS)
        status = setText(serverKey.get(), nullptr, modulePath);
    if (status == ERROR_SUCCESS)
        status = setText(serverKey.get(), L"ThreadingModel", L"Apartment");
    return status;
}

LSTATUS writeHandlerKeys()
{
    for (const wchar_t* name : kHandlerKeys) {
        RegistryKey key;
        LSTATUS status = createKey(HKEY_CLASSES_ROOT, name, key);
        if (status == ERROR_SUCCESS)
            status = setText(key.get(), nullptr, classIdText());
        if (status != ERROR_SUCCESS)
            return status;
    }
    return ERROR_SUCCESS;
}

LSTATUS openApprovedList(RegistryKey& key)
{
    return RegOpenKeyExW(HKEY_LOCAL_MACHINE, kApprovedKey, 0, KEY_SET_VALUE, key.out());
}

void announceChange()
{
    SHChangeNotify(SHCNE_ASSOCCHANGED, SHCNF_IDLIST, nullptr, nullptr);
}

} // namespace

LSTATUS deleteKeyTree(HKEY parent, const wchar_t* name)
{
    RegistryKey key;
    LSTATUS status = RegOpenKeyExW(parent, name, 0, kReadWrite, key.out());
    if (status != ERROR_SUCCESS)
        return status;
    for (;;) {
        wchar_t child[kKeyNameChars];
        DWORD length = kKeyNameChars;
        if (RegEnumKeyExW(key.get(), 0, child, &length, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS)
            break;
        status = deleteKeyTree(key.get(), child);
        if (status != ERROR_SUCCESS)
            return status;
    }
    key.reset();
    return RegDeleteKeyW(parent, name);
}

LSTATUS registerServer()
{
    wchar_t modulePath[MAX_PATH + 1] = {};
    if (GetModuleFileNameW(moduleInstance(), modulePath, MAX_PATH) == 0)
        return static_cast<LSTATUS>(GetLastError());
    LSTATUS status = writeClassKey(modulePath);
    if (status == ERROR_SUCCESS)
        status = writeHandlerKeys();
    if (status == ERROR_SUCCESS && isNtFamily()) {
        RegistryKey approved;
        status = openApprovedList(approved);
        if (status == ERROR_SUCCESS)
            status = setText(approved.get(), classIdText().c_str(), kDisplayName);
    }
    if (status == ERROR_SUCCESS)
        announceChange();
    return status;
}

LSTATUS unregisterServer()
{
    RegistryKey classes;
    LSTATUS status = RegOpenKeyExW(HKEY_CLASSES_ROOT, L"CLSID", 0, kReadWrite, classes.out());
    if (status != ERROR_SUCCESS)
        return status;
    status = deleteKeyTree(classes.get(), classIdText().c_str());
    for (auto name = std::begin(kFormerKeys); status == ERROR_SUCCESS && name != std::end(kFormerKeys); ++name)
        status = deleteKeyTree(classes.get(), *name);
    if (status != ERROR_SUCCESS)
        return status;
    if (isNtFamily()) {
        RegistryKey approved;
        if (openApprovedList(approved) == ERROR_SUCCESS)
            RegDeleteValueW(approved.get(), classIdText().c_str());
    }
    announceChange();
    return ERROR_SUCCESS;
}

} // namespace tavi
