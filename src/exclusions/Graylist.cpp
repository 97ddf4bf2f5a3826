#include "exclusions/Graylist.h"

#include <memory>
#include <mutex>
#include <unordered_map>

#include <windows.h>
#include <shlobj.h>
#include <wx/filename.h>

#include "exclusions/ExclusionRules.h"
#include "exclusions/UserProfiles.h"
#include "exclusions/Volumes.h"
#include "core/CriticalSection.h"
#include "core/Handles.h"
#include "core/InstallPaths.h"
#include "core/Options.h"
#include "core/PublishedPointer.h"
#include "core/Reference.h"
#include "core/RegistryText.h"

namespace tavi {
namespace {

struct PublishedTree {
    CriticalSection buildLock;
    PublishedPointer<const PathTree> current;
};
PublishedTree graylist;
PublishedTree userData;
// Held for a whole build, so that one builder's hives are not unloaded under the other. Locked inside a build lock.
CriticalSection hivesLock;
std::atomic<std::uint32_t> lastListings{0};

using TreeReference = Reference<const PathTree>;

bool isOn(PathState state) noexcept
{
    return state == 1 || state == 3 || state == 5 || state == 7;
}

struct SearchTraits : InvalidIsNone {
    static void free(Handle search) noexcept
    {
        FindClose(search);
    }
};
using SearchHandle = UniqueHandle<SearchTraits>;

// The listings of one build: no folder is listed twice.
class Listings {
  public:
    struct Folder {
        std::uint32_t entries = 0;
        std::uint32_t folders = 0;
        std::vector<wxString> dollarEntries;
    };

    const Folder& of(const wxString& path)
    {
        const auto [place, isNew] = folders_.try_emplace(path);
        if (isNew)
            list(path, place->second);
        return place->second;
    }
    std::uint32_t made() const noexcept
    {
        return static_cast<std::uint32_t>(folders_.size());
    }

  private:
    static void list(const wxString& path, Folder& folder)
    {
        const wxString prefix = path.EndsWith(L"\\") ? path : path + L"\\";
        // What the current list leaves out wholly does not count, but for the users' places.
        const TreeReference left(graylist.current.acquire());
        const TreeReference users(userData.current.acquire());
        const bool consults = left && !(users && isOn(users->lookup(view(path))));
        WIN32_FIND_DATAW entry{};
        const SearchHandle search(FindFirstFileW((prefix + L"*").wc_str(), &entry));
        if (!search)
            return;
        do {
            const std::wstring_view name(entry.cFileName);
            if (name == L"." || name == L"..")
                continue;
            if (name[0] == L'$')
                folder.dollarEntries.emplace_back(entry.cFileName);
            if (consults && left->lookup(view(prefix + entry.cFileName)) == 7)
                continue;
            ++folder.entries;
            folder.folders += (entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
        } while (FindNextFileW(search.get(), &entry));
    }

    std::unordered_map<wxString, Folder, PathHash> folders_;
};

class SystemSources final : public ExclusionSources {
  public:
    explicit SystemSources(Listings& listings) : listings_(listings) {}
    std::set<wxString> mountPoints() override
    {
        return volumeTable().mountPoints();
    }
    std::optional<wxString> registryText(const wxString& key, const wxString& value) override
    {
        return readRegistryText(HKEY_LOCAL_MACHINE, key, value);
    }
    std::vector<wxString> registryTexts(const wxString& key, const wxString& value) override
    {
        std::vector<wxString> texts;
        DWORD bytes = 0;
        const auto query = [&](wchar_t* into) {
            return RegGetValueW(HKEY_LOCAL_MACHINE, key.wc_str(), value.wc_str(), RRF_RT_REG_MULTI_SZ, nullptr, into,
                                &bytes) == ERROR_SUCCESS;
        };
        if (!query(nullptr))
            return texts;
        std::vector<wchar_t> buffer(bytes / sizeof(wchar_t) + 2);
        if (!query(buffer.data()))
            return texts;
        for (const wchar_t* at = buffer.data(); *at != L'\0'; at += texts.back().length() + 1)
            texts.emplace_back(at);
        return texts;
    }
    std::optional<wxString> specialFolder(int number) override
    {
        wchar_t path[MAX_PATH] = L"";
        return SHGetSpecialFolderPathW(nullptr, path, number, FALSE) ? std::optional<wxString>(path) : std::nullopt;
    }
    std::optional<wxString> temporaryFolder() override
    {
        const DWORD size = GetEnvironmentVariableW(L"TEMP", nullptr, 0);
        std::vector<wchar_t> text(size + 1);
        if (size == 0 || GetEnvironmentVariableW(L"TEMP", text.data(), size) == 0)
            return std::nullopt;
        wxFileName path(text.data());
        path.Normalize(wxPATH_NORM_ENV_VARS | wxPATH_NORM_DOTS | wxPATH_NORM_TILDE | wxPATH_NORM_ABSOLUTE |
                       wxPATH_NORM_LONG | wxPATH_NORM_SHORTCUT);
        return path.GetFullPath();
    }
    wxString windowsFolder() override
    {
        wchar_t path[MAX_PATH] = L"";
        GetWindowsDirectoryW(path, MAX_PATH);
        return path;
    }
    std::vector<wxString> dollarEntries(const wxString& folder) override
    {
        return listings_.of(folder).dollarEntries;
    }
    wxString serviceDataFolder() override
    {
        return getDataFilePath(kDataDirectory);
    }
    std::vector<wxString> userFolders(const wxString& name) override
    {
        return shellFolderPaths(name);
    }
    bool exists(const wxString& folder) override
    {
        const DWORD attributes = GetFileAttributesW(folder.wc_str());
        return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY);
    }
    bool keepsUserPlaces() override
    {
        return readGraylistEnabled().value_or(false);
    }

  private:
    Listings& listings_;
};

class UserHives {
  public:
    UserHives() : guard_(hivesLock)
    {
        loadUserHives();
    }
    ~UserHives()
    {
        unloadUserHives();
    }
    UserHives(const UserHives&) = delete;
    UserHives& operator=(const UserHives&) = delete;

  private:
    const std::lock_guard<CriticalSection> guard_;
};

using AddRules = void (*)(ExclusionSources& sources, const RuleSink& add);

// Returns the new tree with a reference for the caller; readers get it before the hives are unloaded.
TreeReference buildAndPublish(PublishedTree& published, AddRules addRules)
{
    const UserHives hives;
    const auto listings = std::make_shared<Listings>();
    PathTree* const tree = PathTree::create(false, [listings](const wxString& folder, bool foldersOnly) {
        const Listings::Folder& listed = listings->of(folder);
        return foldersOnly ? listed.folders : listed.entries;
    });
    tree->AddRef();
    TreeReference built(tree);
    volumeTable().refreshVolumes();
    SystemSources sources(*listings);
    addRules(sources, [&](const wxString& path, PathState state) { tree->insert(view(path), state); });
    tree->finish();
    lastListings = listings->made();
    built->AddRef();
    published.current.replace(built.get());
    return built;
}

// The current tree, or a new one, with a reference. `waited`: another thread has published it during this call.
TreeReference obtain(PublishedTree& published, AddRules addRules, bool refresh, bool& waited)
{
    waited = false;
    if (!refresh) {
        if (TreeReference current(published.current.acquire()); current)
            return current;
    }
    const std::lock_guard guard(published.buildLock);
    if (refresh) {
        published.current.replace(nullptr);
    } else if (TreeReference current(published.current.acquire()); current) {
        waited = true;
        return current;
    }
    return buildAndPublish(published, addRules);
}

PathState stateOf(PublishedTree& published, AddRules addRules, const wxString& path)
{
    bool waited = false;
    return obtain(published, addRules, false, waited)->lookup(view(path));
}

} // namespace

const PathTree* getGraylist(bool refresh)
{
    bool waited = false;
    TreeReference tree = obtain(graylist, addMachineRules, refresh, waited);
    // Who has waited for another builder gets no reference; the published one keeps the tree until the next refresh.
    return waited ? tree.get() : tree.release();
}

void buildGraylist(bool refresh)
{
    bool waited = false;
    obtain(graylist, addMachineRules, refresh, waited);
}

const PathTree* getUserDataTree(bool refresh)
{
    bool waited = false;
    return obtain(userData, addUserRules, refresh, waited).get();
}

bool isGrayed(const wxString& path)
{
    const PathState state = stateOf(graylist, addMachineRules, path);
    return state == 3 || state == 5 || state == 7;
}

bool isPartlyGrayed(const wxString& path)
{
    const PathState state = stateOf(graylist, addMachineRules, path);
    return state == 1 || state == 3 || state == 5;
}

bool isUserData(const wxString& path)
{
    return isOn(stateOf(userData, addUserRules, path));
}

void dropGraylist() noexcept
{
    // At the end of the process whoever held the lock may be dead; the pointer itself can be replaced at any time.
    const bool locked = graylist.buildLock.try_lock();
    graylist.current.replace(nullptr);
    if (locked)
        graylist.buildLock.unlock();
}

std::uint32_t graylistListings() noexcept
{
    return lastListings;
}

} // namespace tavi
