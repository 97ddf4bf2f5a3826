#include "exclusions/Privileges.h"

#include <memory>
#include <new>

namespace tavi {

bool isPrivilegeEnabled(HANDLE token, const wchar_t* privilege) noexcept
{
    LUID id{};
    DWORD size = 0;
    if (!LookupPrivilegeValueW(nullptr, privilege, &id) ||
        GetTokenInformation(token, TokenPrivileges, nullptr, 0, &size) || GetLastError() != ERROR_INSUFFICIENT_BUFFER)
        return false;
    const std::unique_ptr<BYTE[]> bytes(new (std::nothrow) BYTE[size]);
    if (!bytes || !GetTokenInformation(token, TokenPrivileges, bytes.get(), size, &size))
        return false;
    const auto& list = *reinterpret_cast<const TOKEN_PRIVILEGES*>(bytes.get());
    for (DWORD i = 0; i < list.PrivilegeCount; ++i) {
        const LUID_AND_ATTRIBUTES& entry = list.Privileges[i];
        if (entry.Luid.LowPart == id.LowPart && entry.Luid.HighPart == id.HighPart)
            return (entry.Attributes & SE_PRIVILEGE_ENABLED) != 0;
    }
    return false;
}

bool setPrivilege(HANDLE token, const wchar_t* privilege, bool enable) noexcept
{
    TOKEN_PRIVILEGES change{};
    change.PrivilegeCount = 1;
    change.Privileges[0].Attributes = enable ? SE_PRIVILEGE_ENABLED : 0;
    return LookupPrivilegeValueW(nullptr, privilege, &change.Privileges[0].Luid) &&
           AdjustTokenPrivileges(token, FALSE, &change, 0, nullptr, nullptr);
}

} // namespace tavi
