#pragma once

#include <windows.h>

namespace tavi {

// Both return false on any failure. Any thread.
bool isPrivilegeEnabled(HANDLE token, const wchar_t* privilege) noexcept;
bool setPrivilege(HANDLE token, const wchar_t* privilege, bool enable) noexcept;

} // namespace tavi
