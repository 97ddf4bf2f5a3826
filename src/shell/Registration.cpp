#include "shell/Registration.h"

#include <cwchar>

#include <shlobj.h>

#include "core/Handles.h"
#include "core/Module.h"

namespace tavi {
namespace {

#define TAVI_CLASS_ID_TEXT L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}"
const wchar_t kClassId[] = TAVI_CLASS_ID_TEXT;
const wchar_t kClassKey[] = L"CLSID\\" TAVI_CLASS_ID_TEXT;
const wchar_t kDisplayName[] = L"Tavi Remote Backup Shell Extension";
const wchar_t kApprovedKey[] = L"Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved";
constexpr REGSAM kReadWrite = KEY_READ | KEY_WRITE;
constexpr DWORD kNameBuffer = 256;

const wchar_t* const kHandlerKeys[] = {
    L"AllFilesystemObjects\\shellex\\ContextMenuHandlers\\Tavi",
    L"Drive\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\Background\\shellex\\ContextMenuHandlers\\Tavi",
    L"Folder\\shellex\\ContextMenuHandlers\\Tavi",
};

// Relative to the opened CLSID key, so that all but the first miss and the run ends with "not found" after the class
// key: the handler keys stay behind. Required so; the README tells how to remove them.
const wchar_t* const kKeysToDelete[] = {
    kClassId,
    L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi",
    L"AllFileSystemObjects\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\Background\\shellex\\ContextMenuHandlers\\Tavi",
    L"Directory\\shellex\\ContextMenuHandlers\\Tavi",
    L"Drive\\shellex\\ContextMenuHandlers\\Tavi",
    L"Folder\\shellex\\ContextMenuHandlers\\Tavi",
    L"*\\shellex\\ContextMenuHandlers\\Tavi",
};

bool isNtFamily()
{
    return (GetVersion() & 0x80000000u) == 0;
}

LSTATUS setText(HKEY key, const wchar_t* valueName, const wchar_t* text)
{
    const std::size_t bytes = (std::wcslen(text) + 1) * sizeof(*text);
    return RegSetValueExW(key, valueName, 0, REG_SZ, reinterpret_cast<const BYTE*>(text), static_cast<DWORD>(bytes));
}

LSTATUS createKey(HKEY parent, const wchar_t* name, RegistryKey& key)
{
    return RegCreateKeyExW(parent, name, 0, nullptr, REG_OPTION_NON_VOLATILE, kReadWrite, nullptr, key.out(), nullptr);
}

LSTATUS writeClassKey(const wchar_t* modulePath)
{
    RegistryKey classKey;
    LSTATUS status = createKey(HKEY_CLASSES_ROOT, kClassKey, classKey);
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
            status = setText(key.get(), nullptr, kClassId);
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
        wchar_t child[kNameBuffer];
        DWORD length = kNameBuffer;
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
            status = setText(approved.get(), kClassId, kDisplayName);
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
    for (const wchar_t* name : kKeysToDelete) {
        status = deleteKeyTree(classes.get(), name);
        if (status != ERROR_SUCCESS)
            return status;
    }
    if (isNtFamily()) {
        RegistryKey approved;
        if (openApprovedList(approved) == ERROR_SUCCESS)
            RegDeleteValueW(approved.get(), kClassId);
    }
    announceChange();
    return ERROR_SUCCESS;
}

} // namespace tavi
