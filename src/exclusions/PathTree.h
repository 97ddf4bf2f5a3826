#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <unordered_map>

#include <wx/string.h>

#include "core/FolderState.h"
#include "core/Paths.h"
#include "core/RefCounted.h"

namespace tavi {

// Returns how many entries a folder has, hidden ones included; 0 also if it cannot be listed. With `foldersOnly` only
// sub-folders count.
using EntryCounter = std::function<std::uint32_t(const wxString& folder, bool foldersOnly)>;

// Rules by full path, and the state that applies to any path: that of its own rule, or the one inherited from the
// nearest folder with a rule. Names are compared exactly. One thread inserts the rules; once published a tree is
// immutable, and lookups need no lock.
class PathTree : public RefCounted<PathTree> {
  public:
    // The counter is called while rules are inserted, at most once for each folder.
    static RefPtr<PathTree> create(bool foldersOnly, EntryCounter counter);

    // Inserts a rule. A rule on a folder replaces every rule below it.
    void insert(std::wstring_view path, FolderState state);
    // Releases the counter after the last rule.
    void finish() noexcept
    {
        counter_ = nullptr;
    }
    FolderState lookup(std::wstring_view path) const;

    // Visits every node but the root, parents first, names in order.
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
    static Node& makeChild(Node& parent, const wxString& name);
    void recompute(Node& node) const;
    static void removeChildren(Node& node) noexcept;

    Node root_;
    EntryCounter counter_;
};

} // namespace tavi
