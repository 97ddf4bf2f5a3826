#include "Backup.h"

#include <windows.h>
#include <shlwapi.h>

#include <algorithm>
#include <ctime>
#include <map>
#include <set>

#include "ContentStore.h"
#include "Database.h"
#include "History.h"
#include "StoredManifest.h"
#include "Text.h"

namespace service {
namespace {

// The state that the extension knows a backed-up folder by.
constexpr std::int64_t kBackedUpState = 6;

std::uint64_t ticks(const FILETIME& time)
{
    return std::uint64_t{time.dwHighDateTime} << 32 | time.dwLowDateTime;
}

std::wstring join(const std::wstring& folder, const std::wstring& name)
{
    return folder.back() == L'\\' ? folder + name : folder + L"\\" + name;
}

// A folder as the shell would spell it: the drive's letter in upper case, every name as it is on the disk.
std::wstring spelledFolder(const std::wstring& given)
{
    wchar_t full[MAX_PATH];
    const DWORD length = GetFullPathNameW(given.c_str(), MAX_PATH, full, nullptr);
    if (length == 0 || length >= MAX_PATH || !PathIsDirectoryW(full))
        throw Failure{L"no such folder: " + given};
    if (full[1] == L':')
        CharUpperBuffW(full, 1);
    if (!PathIsRootW(full))
        PathRemoveBackslashW(full);
    const wchar_t* rest = PathSkipRootW(full);
    std::wstring path(static_cast<const wchar_t*>(full), rest);
    while (*rest) {
        const wchar_t* const end = rest + std::wcscspn(rest, L"\\");
        WIN32_FIND_DATAW data;
        const HANDLE search = FindFirstFileW(longPath(join(path, std::wstring(rest, end))).c_str(), &data);
        if (search == INVALID_HANDLE_VALUE)
            throw systemFailure(given, GetLastError());
        FindClose(search);
        path = join(path, data.cFileName);
        rest = *end ? end + 1 : end;
    }
    return path;
}

class Run {
  public:
    Run(const Installation& installation, std::int64_t time, std::map<std::wstring, Version> former)
        : installation_(installation), store_(installation.storeFolder()), time_(time), former_(std::move(former))
    {
    }

    void visit(const std::wstring& folder)
    {
        // The store would grow by itself at every run.
        if (lstrcmpiW(folder.c_str(), installation_.folder.c_str()) == 0)
            return;
        WIN32_FIND_DATAW data;
        const HANDLE search = FindFirstFileW(longPath(join(folder, L"*")).c_str(), &data);
        if (search == INVALID_HANDLE_VALUE) {
            skip(folder, systemFailure(folder, GetLastError()));
            return;
        }
        std::vector<std::wstring> folders;
        do {
            const std::wstring name = data.cFileName;
            // A link may lead out of the folder or round in a circle.
            if (name == L"." || name == L".." || (data.dwFileAttributes & FILE_ATTRIBUTE_REPARSE_POINT))
                continue;
            if (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
                folders.push_back(join(folder, name));
            else
                visitFile(join(folder, name), data);
        } while (FindNextFileW(search, &data));
        FindClose(search);
        for (const std::wstring& inner : folders)
            visit(inner);
    }

    // After the last visit.
    void findVanished(const std::vector<std::wstring>& roots)
    {
        for (const auto& [path, version] : former_) {
            if (version.size == kDeletedSize || seen_.count(path) || !isUnder(path, roots) || isUnder(path, skipped_))
                continue;
            versions_[path].time = time_;
            ++deleted_;
        }
    }

    void addRunItself()
    {
        std::wstring list;
        for (const auto& [path, version] : former_) {
            if (path != kRunsPath && !versions_.count(path) && version.size != kDeletedSize)
                list += version.content + L" " + path + L"\n";
        }
        for (const auto& [path, version] : versions_) {
            if (version.size != kDeletedSize)
                list += version.content + L" " + path + L"\n";
        }
        const ContentStore::Content content = store_.addBytes(toUtf8(list));
        FILETIME now;
        GetSystemTimeAsFileTime(&now);
        versions_[kRunsPath] = {time_, content.size, ticks(now), ticks(now), 0, content.hash};
    }

    const std::map<std::wstring, Version>& versions() const
    {
        return versions_;
    }
    bool complete() const
    {
        return skipped_.empty();
    }
    std::wstring summary() const
    {
        const auto count = [](std::size_t number, const wchar_t* what) {
            return std::to_wstring(number) + L" " + what;
        };
        return count(seen_.size(), L"files, ") + count(added_, L"new, ") + count(changed_, L"changed, ") +
               count(deleted_, L"deleted, ") + count(skipped_.size(), L"not read\n");
    }

  private:
    static bool isUnder(const std::wstring& path, const std::vector<std::wstring>& roots)
    {
        return std::any_of(roots.begin(), roots.end(), [&](const std::wstring& root) {
            const std::wstring inside = join(root, L"");
            return path == root || path.compare(0, inside.size(), inside) == 0;
        });
    }

    void visitFile(const std::wstring& path, const WIN32_FIND_DATAW& data)
    {
        // A folder may be given twice, or beside one that it lies in.
        if (!seen_.insert(path).second)
            return;
        Version version;
        version.time = time_;
        version.modified = ticks(data.ftLastWriteTime);
        version.created = ticks(data.ftCreationTime);
        version.attributes = data.dwFileAttributes;
        const auto size = static_cast<std::int64_t>(std::uint64_t{data.nFileSizeHigh} << 32 | data.nFileSizeLow);
        const auto former = former_.find(path);
        const bool isNew = former == former_.end() || former->second.size == kDeletedSize;
        if (!isNew && former->second.size == size && former->second.modified == version.modified &&
            former->second.attributes == version.attributes)
            return;
        try {
            ContentStore::Content content = store_.addFile(path);
            version.size = content.size;
            version.content = std::move(content.hash);
        } catch (const Failure& failure) {
            skip(path, failure);
            return;
        }
        versions_.emplace(path, std::move(version));
        ++(isNew ? added_ : changed_);
    }

    void skip(const std::wstring& path, const Failure& failure)
    {
        printError(L"skipped " + failure.text + L"\n");
        skipped_.push_back(path);
    }

    const Installation& installation_;
    ContentStore store_;
    std::int64_t time_;
    std::map<std::wstring, Version> former_;
    std::map<std::wstring, Version> versions_;
    std::set<std::wstring> seen_;
    std::vector<std::wstring> skipped_;
    std::size_t added_ = 0;
    std::size_t changed_ = 0;
    std::size_t deleted_ = 0;
};

} // namespace

bool backUp(const Installation& installation, const std::vector<std::wstring>& folders,
            std::optional<std::int64_t> time)
{
    std::vector<std::wstring> roots;
    for (const std::wstring& folder : folders)
        roots.push_back(spelledFolder(folder));

    History history(installation);
    // Versions stand in the manifest oldest first, each with a time of its own.
    const std::int64_t last = history.lastRun();
    if (time && *time <= last)
        throw Failure{L"there is already a run at " + std::to_wstring(last)};
    const std::int64_t now = time.value_or(std::max<std::int64_t>(std::time(nullptr), last + 1));

    Run run(installation, now, history.newest());
    for (const std::wstring& root : roots)
        run.visit(root);
    run.findVanished(roots);
    run.addRunItself();
    history.addRun(run.versions());

    Database configuration(installation.configDatabase());
    Transaction transaction(configuration);
    Statement insert(configuration, "INSERT OR REPLACE INTO filesystem(state, folder) VALUES(?,?)");
    for (const std::wstring& root : roots)
        insert.bind(1, kBackedUpState).bind(2, root).next();
    transaction.commit();

    Database state(installation.stateDatabase());
    writeManifest(state, history.manifestText());
    announceManifest();
    print(L"run " + std::to_wstring(now) + L": " + run.summary());
    return run.complete();
}

} // namespace service
