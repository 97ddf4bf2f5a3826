#include "core/Paths.h"

#include <vector>

#include <windows.h>

namespace tavi {

wxString longPath(const wxString& path)
{
    std::vector<wchar_t> buffer(path.length() + 1);
    DWORD length = 0;
    // Repeated after growing; a path that changes meanwhile may need more.
    while ((length = GetLongPathNameW(path.wc_str(), buffer.data(), static_cast<DWORD>(buffer.size()))) >=
           buffer.size())
        buffer.resize(length + 1);
    if (length >= 2 && buffer[1] == L':' && buffer[0] >= L'a' && buffer[0] <= L'z')
        buffer[0] = static_cast<wchar_t>(buffer[0] - L'a' + L'A');
    return wxString(buffer.data(), length);
}

} // namespace tavi
