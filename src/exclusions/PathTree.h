#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <unordered_map>
#include <vector>

#include <wx/string.h>

#include "core/FolderState.h"
#include "core/Paths.h"
#include "core/RefCounted.h"

namespace tavi {

// How many entries a folder has, hidden ones included; 0 also when it cannot be listed. With `foldersOnly` only
// sub-folders count.
using EntryCounter = std::function<std::uint32_t(const wxString& folder, bool foldersOnly)>;

// Rules by full path, and the state that applies to any path: its own rule, or what it inherits from the nearest folder
// that has one. Names are compared exactly. Filled by one thread, then published and never changed again; lookups need
// no lock.
class PathTree : public RefCounted<PathTree> {
  public:
    // The counter is used while rules are inserted, at most once for a node.
    static RefPtr<PathTree> create(bool foldersOnly, EntryCounter counter);

    // A rule on a folder replaces every rule below it.
    void insert(std::wstring_view path, FolderState state);
    void insertAll(const std::vector<wxString>& paths, FolderState state);
    // No rule comes any more: the counter goes.
    void finish() noexcept
    {
        counter_ = nullptr;
    }
    FolderState lookup(std::wstring_view path) const;

    // Every node but the root, parents first, names in order.
    void forEach(const std::function<void(const wxString& path, FolderState state)>& visit) const;

  private:
    struct Node {
        std::unordered_map<wxString, std::unique_ptr<Node>, PathHash> children;
        Node* parent = nullptr;
        wxString name;
        wxString fullPath;
        FolderState state = FolderState::off;
        bool foldersOnly = false;
        static constexpr std::uint32_t kNotCounted = UINT32_MAX;
        std::uint32_t entryCount = kNotCounted;
    };

    PathTree(bool foldersOnly, EntryCounter counter);
    ~PathTree();
    friend class RefCounted<PathTree>;
    Node& makeChild(Node& parent, const wxString& name, FolderState state);
    void recompute(Node& node) const;
    static void removeChildren(Node& node) noexcept;

    Node root_;
    EntryCounter counter_;
};

} // namespace tavi
