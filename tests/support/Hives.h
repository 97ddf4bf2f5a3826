#pragma once

#include <vector>

#include <gtest/gtest.h>

#include "tests/support/Registry.h"

namespace tavi::test {

// Returns the hives that the module has loaded.
inline std::vector<std::wstring> temporaryHives()
{
    std::vector<std::wstring> names;
    wchar_t name[256];
    for (DWORD index = 0; RegEnumKeyW(HKEY_USERS, index, name, 256) == ERROR_SUCCESS; ++index) {
        if (std::wstring_view(name).substr(0, 4) == L"tavi")
            names.emplace_back(name);
    }
    return names;
}

// Unloads a hive behind the module's back.
inline void unloadHive(const std::wstring& name)
{
    const KernelHandle token = processToken();
    setPrivilege(token.get(), L"SeRestorePrivilege", true);
    EXPECT_EQ(RegUnLoadKeyW(HKEY_USERS, name.c_str()), ERROR_SUCCESS);
    setPrivilege(token.get(), L"SeRestorePrivilege", false);
}

} // namespace tavi::test
