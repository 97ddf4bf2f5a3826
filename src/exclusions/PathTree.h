#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <unordered_map>
#include <vector>

#include <wx/string.h>

#include "core/PathSet.h"

namespace tavi {

// 0 to 8. Odd: the rule of the node is on. 7 and 8: on or off for the node and everything beneath it; the others sum up
// nodes with mixed contents.
using PathState = std::uint32_t;

// How many entries a folder has, hidden ones included; 0 also when it cannot be listed. With `foldersOnly` only
// sub-folders count.
using EntryCounter = std::function<std::uint32_t(const wxString& folder, bool foldersOnly)>;

// Rules by full path, and the state that applies to any path: its own rule, or what it inherits from the nearest folder
// that has one. Names are compared exactly. Filled by one thread, then published and never changed again; lookups need
// no lock. Counted by AddRef and Release, from any thread.
class PathTree {
  public:
    // With no reference yet. The counter is used while rules are inserted, at most once for a node.
    static PathTree* create(bool foldersOnly, EntryCounter counter);
    PathTree(const PathTree&) = delete;
    PathTree& operator=(const PathTree&) = delete;

    // A rule on a folder replaces every rule below it.
    void insert(std::wstring_view path, PathState state);
    void insertAll(const std::vector<wxString>& paths, PathState state);
    // No rule comes any more: the counter goes.
    void finish() noexcept
    {
        counter_ = nullptr;
    }
    PathState lookup(std::wstring_view path) const;

    void AddRef() const noexcept
    {
        addRefs(1);
    }
    void addRefs(int count) const noexcept
    {
        refs_ += count;
    }
    void Release() const noexcept;

    // Every node but the root, parents first, names in order.
    void forEach(const std::function<void(const wxString& path, PathState state)>& visit) const;

  private:
    struct Node {
        std::unordered_map<wxString, std::unique_ptr<Node>, PathHash> children;
        Node* parent = nullptr;
        wxString name;
        wxString fullPath;
        PathState state = 0;
        bool foldersOnly = false;
        static constexpr std::uint32_t kNotCounted = UINT32_MAX;
        std::uint32_t entryCount = kNotCounted;
    };

    PathTree(bool foldersOnly, EntryCounter counter);
    ~PathTree();
    Node& makeChild(Node& parent, const wxString& name, PathState state);
    void recompute(Node& node) const;
    static void removeChildren(Node& node) noexcept;

    mutable std::atomic<std::int32_t> refs_{0};
    Node root_;
    EntryCounter counter_;
};

} // namespace tavi
