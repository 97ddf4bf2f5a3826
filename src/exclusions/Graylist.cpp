#include "exclusions/Graylist.h"

#include <memory>
#include <mutex>
#include <utility>

#include "core/CriticalSection.h"
#include "core/PublishedPointer.h"
#include "core/ScopeGuard.h"
#include "exclusions/ExclusionRules.h"
#include "exclusions/FolderListings.h"
#include "exclusions/SystemSources.h"
#include "exclusions/UserProfiles.h"
#include "exclusions/Volumes.h"

namespace tavi {
namespace {

using PathTreeRef = RefPtr<const PathTree>;
using AddRules = void (*)(const ExclusionSources& sources, const RuleSink& add);

struct PublishedTree {
    const AddRules addRules;
    CriticalSection buildLock;
    PublishedPointer<const PathTree> current;
};
PublishedTree graylist{addMachineRules, {}, {}};
PublishedTree userData{addUserRules, {}, {}};
// Held for a whole build, so that one builder does not unload the other's hives. Locked inside a build lock.
CriticalSection hivesLock;

// Returns the new tree. Publishes it before unloading the hives, which may be slow.
PathTreeRef buildAndPublish(PublishedTree& published)
{
    const std::lock_guard guard(hivesLock);
    loadUserHives();
    const ScopeGuard unloading(unloadUserHives);
    const auto listings = std::make_shared<FolderListings>([] { return graylist.current.acquire(); },
                                                           [] { return userData.current.acquire(); });
    const RefPtr<PathTree> tree = PathTree::create(false, [listings](const wxString& folder, bool foldersOnly) {
        const FolderListings::Folder& listed = listings->find(folder);
        return foldersOnly ? listed.folders : listed.entries;
    });
    volumeTable().refreshVolumes();
    published.addRules(systemSources(*listings),
                       [&](const wxString& path, FolderState state) { tree->insert(view(path), state); });
    tree->finish();
    published.current.replace(tree);
    return tree;
}

struct Current {
    PathTreeRef tree;
    // Another thread published the tree while this one waited.
    bool waited;
};

// Returns the current tree; builds one if there is none or if `refresh` is set.
Current currentOrNew(PublishedTree& published, bool refresh)
{
    if (!refresh) {
        if (PathTreeRef current = published.current.acquire())
            return {std::move(current), false};
    }
    const std::lock_guard guard(published.buildLock);
    if (refresh) {
        published.current.replace({});
    } else if (PathTreeRef current = published.current.acquire()) {
        return {std::move(current), true};
    }
    return {buildAndPublish(published), false};
}

FolderState stateOf(PublishedTree& published, const wxString& path)
{
    return currentOrNew(published, false).tree->lookup(view(path));
}

} // namespace

const PathTree* getGraylist(bool refresh)
{
    Current current = currentOrNew(graylist, refresh);
    // A caller that waited for another builder gets no reference of its own; the published one keeps the tree until the
    // next refresh. Callers outside of this tree (see ARCHITECTURE.md) release none then.
    return current.waited ? current.tree.get() : current.tree.release();
}

void buildGraylist(bool refresh)
{
    currentOrNew(graylist, refresh);
}

const PathTree* getUserDataTree(bool refresh)
{
    return currentOrNew(userData, refresh).tree.get();
}

bool isGrayed(const wxString& path)
{
    const FolderState state = stateOf(graylist, path);
    return state == FolderState::onSomeOn || state == FolderState::onMostOn || state == FolderState::allOn;
}

bool isPartlyGrayed(const wxString& path)
{
    const FolderState state = stateOf(graylist, path);
    return state == FolderState::on || state == FolderState::onSomeOn || state == FolderState::onMostOn;
}

bool isUserData(const wxString& path)
{
    return isRuleOn(stateOf(userData, path));
}

void dropGraylist() noexcept
{
    const std::lock_guard guard(graylist.buildLock);
    graylist.current.replace({});
}

} // namespace tavi
