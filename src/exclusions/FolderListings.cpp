#include "exclusions/FolderListings.h"

#include <string_view>

#include <windows.h>

#include "core/Handles.h"

namespace tavi {

const FolderListings::Folder& FolderListings::find(const wxString& path)
{
    const auto [place, isNew] = folders_.try_emplace(path);
    if (isNew)
        list(path, place->second);
    return place->second;
}

void FolderListings::list(const wxString& path, Folder& folder) const
{
    const wxString prefix = path.EndsWith(L"\\") ? path : path + L"\\";
    const RefPtr<const PathTree> excluded = excluded_();
    const RefPtr<const PathTree> userData = userData_();
    const bool consults = excluded && !(userData && isRuleOn(userData->lookup(view(path))));
    WIN32_FIND_DATAW entry{};
    const FindHandle find(FindFirstFileW((prefix + L"*").wc_str(), &entry));
    if (!find)
        return;
    do {
        const std::wstring_view name(entry.cFileName);
        if (name == L"." || name == L"..")
            continue;
        if (name[0] == L'$')
            folder.dollarEntries.emplace_back(entry.cFileName);
        if (consults && excluded->lookup(view(prefix + entry.cFileName)) == FolderState::allOn)
            continue;
        ++folder.entries;
        folder.folders += (entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
    } while (FindNextFileW(find.get(), &entry));
}

} // namespace tavi
