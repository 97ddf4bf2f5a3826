#include "exclusions/PathTree.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace tavi {
namespace {

constexpr wchar_t kSeparator = L'\\';

// A summary of the states of a node's children.
struct Summary {
    bool plain = false;  // beneath some child nothing is on
    bool marked = false; // beneath some child something is on
    bool mixed = false;  // beneath some child something, but not everything, is on

    void add(FolderState state) noexcept
    {
        plain |= state <= FolderState::on || state == FolderState::allOff;
        marked |= state >= FolderState::offSomeOn && state <= FolderState::allOn;
        mixed |= state >= FolderState::offSomeOn && state <= FolderState::onMostOn;
    }
};

// Returns the new state of a folder some of whose entries have no node of their own: those inherit the folder's state.
FolderState stateOfSparseFolder(FolderState own, Summary children) noexcept
{
    switch (own) {
    case FolderState::off:
    case FolderState::offSomeOn:
    case FolderState::allOff:
        return children.marked || children.mixed ? FolderState::offSomeOn : FolderState::off;
    case FolderState::on:
    case FolderState::onSomeOn:
        return !children.mixed && !children.plain ? FolderState::allOn
               : children.marked                  ? FolderState::onSomeOn
                                                  : FolderState::onMostOn;
    case FolderState::offMostOn:
    case FolderState::offAllOn:
        return children.mixed || children.plain ? FolderState::offMostOn : FolderState::offAllOn;
    case FolderState::onMostOn:
    case FolderState::allOn:
        return children.mixed || children.plain ? FolderState::onMostOn : FolderState::allOn;
    default:
        return FolderState::off;
    }
}

// Returns the new state of a folder each of whose entries has a node of its own.
FolderState stateOfCoveredFolder(FolderState own, Summary children) noexcept
{
    if (own > FolderState::allOff)
        return FolderState::off;
    const bool isOn = isRuleOn(own);
    if (children.marked && !children.mixed && !children.plain)
        return isOn ? FolderState::allOn : FolderState::offAllOn;
    if (children.marked || children.mixed)
        return isOn ? FolderState::onSomeOn : FolderState::offSomeOn;
    return isOn ? FolderState::on : FolderState::off;
}

// Returns the first component of `rest` and removes it with its separator; sets `last` if there was no separator.
std::wstring_view takeComponent(std::wstring_view& rest, bool& last) noexcept
{
    const std::size_t end = rest.find(kSeparator);
    last = end == std::wstring_view::npos;
    const std::wstring_view component = rest.substr(0, end);
    rest = last ? std::wstring_view() : rest.substr(end + 1);
    return component;
}

wxString text(std::wstring_view component)
{
    return wxString(component.data(), component.size());
}

} // namespace

RefPtr<PathTree> PathTree::create(bool foldersOnly, EntryCounter counter)
{
    return RefPtr<PathTree>(new PathTree(foldersOnly, std::move(counter)));
}

PathTree::PathTree(bool foldersOnly, EntryCounter counter) : counter_(std::move(counter))
{
    root_.foldersOnly = foldersOnly;
}

PathTree::~PathTree()
{
    removeChildren(root_);
}

// Without recursion: a path may have as many components as characters.
void PathTree::removeChildren(Node& node) noexcept
{
    for (Node* at = &node; at != &node || !node.children.empty();) {
        if (!at->children.empty()) {
            at = at->children.begin()->second.get();
        } else {
            at = at->parent;
            at->children.erase(at->children.begin());
        }
    }
}

PathTree::Node& PathTree::makeChild(Node& parent, const wxString& name)
{
    auto child = std::make_unique<Node>();
    child->parent = &parent;
    child->name = name;
    child->fullPath = parent.fullPath;
    if (!parent.fullPath.empty() && parent.fullPath.Last() != kSeparator)
        child->fullPath += kSeparator;
    child->fullPath += name;
    // So that what has no rule of its own beneath it still inherits the same.
    child->state = parent.state;
    child->foldersOnly = parent.foldersOnly;
    return *(parent.children[name] = std::move(child));
}

void PathTree::insert(std::wstring_view path, FolderState state)
{
    Node* node = &root_;
    for (bool last = false; !last;) {
        Node* const parent = node;
        const wxString name = text(takeComponent(path, last));
        const auto found = parent->children.find(name);
        if (found != parent->children.end()) {
            node = found->second.get();
        } else if (parent->state == FolderState::off && state == FolderState::off) {
            // The rule would change nothing.
            break;
        } else {
            node = &makeChild(*parent, name);
        }
        if (last) {
            node->state = state;
            removeChildren(*node);
            node = parent;
        }
    }
    for (; node; node = node->parent)
        recompute(*node);
}

void PathTree::recompute(Node& node) const
{
    if (node.entryCount == Node::kNotCounted)
        node.entryCount = node.fullPath.empty() ? 0 : counter_(node.fullPath, node.foldersOnly);
    // A folder that is missing or cannot be listed keeps the state of its rule; so does the root.
    if (node.entryCount == 0)
        return;
    Summary children;
    for (const auto& [name, child] : node.children)
        children.add(child->state);
    const bool isCovered = node.children.size() == node.entryCount;
    node.state = isCovered ? stateOfCoveredFolder(node.state, children) : stateOfSparseFolder(node.state, children);
}

FolderState PathTree::lookup(std::wstring_view path) const
{
    const Node* node = &root_;
    while (!path.empty()) {
        bool last = false;
        const auto child = node->children.find(text(takeComponent(path, last)));
        if (child == node->children.end())
            return inherited(node->state);
        node = child->second.get();
    }
    return node->state;
}

void PathTree::forEach(const std::function<void(const wxString& path, FolderState state)>& visit) const
{
    std::vector<const Node*> waiting = {&root_};
    while (!waiting.empty()) {
        const Node* const node = waiting.back();
        waiting.pop_back();
        if (node != &root_)
            visit(node->fullPath, node->state);
        const auto firstNew = static_cast<std::ptrdiff_t>(waiting.size());
        for (const auto& [name, child] : node->children)
            waiting.push_back(child.get());
        std::sort(waiting.begin() + firstNew, waiting.end(),
                  [](const Node* one, const Node* other) { return one->name > other->name; });
    }
}

} // namespace tavi
