#include "exclusions/PathTree.h"

#include <algorithm>
#include <utility>

namespace tavi {
namespace {

constexpr wchar_t kSeparator = L'\\';

// What the states of a node's children say together.
struct Summary {
    bool plain = false;  // some are 0, 1 or 8
    bool marked = false; // some are 2 to 7
    bool mixed = false;  // some are 2 to 5
};

// Some entries on disk have no node: they take after the node's own state.
PathState withOthers(PathState own, Summary children) noexcept
{
    switch (own) {
    case 0:
    case 2:
    case 8:
        return children.marked || children.mixed ? 2 : 0;
    case 1:
    case 3:
        return !children.mixed && !children.plain ? 7 : children.marked ? 3 : 5;
    case 4:
    case 6:
        return children.mixed || children.plain ? 4 : 6;
    case 5:
    case 7:
        return children.mixed || children.plain ? 5 : 7;
    default:
        return 0;
    }
}

// Every entry on disk has its node.
PathState withoutOthers(PathState own, Summary children) noexcept
{
    if (own > 8)
        return 0;
    const PathState odd = own % 2;
    if (children.marked)
        return (children.mixed || children.plain ? 2 : 6) + odd;
    return (children.mixed ? 2 : 0) + odd;
}

PathState inherited(PathState state) noexcept
{
    switch (state) {
    case 0:
    case 2:
        return 8;
    case 1:
    case 3:
    case 5:
        return 7;
    default:
        return state;
    }
}

// The first component of `rest`, which keeps what follows the separator; `last` when nothing does.
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

PathTree* PathTree::create(bool foldersOnly, EntryCounter counter)
{
    return new PathTree(foldersOnly, std::move(counter));
}

PathTree::PathTree(bool foldersOnly, EntryCounter counter) : counter_(std::move(counter))
{
    root_.foldersOnly = foldersOnly;
}

void PathTree::Release() const noexcept
{
    if (--refs_ < 1)
        delete this;
}

PathTree::~PathTree()
{
    removeChildren(root_);
}

// Not by recursion: a path may have as many components as it has characters.
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

PathTree::Node& PathTree::makeChild(Node& parent, const wxString& name, PathState state)
{
    auto child = std::make_unique<Node>();
    child->parent = &parent;
    child->name = name;
    child->fullPath = parent.fullPath;
    if (!parent.fullPath.empty() && parent.fullPath.Last() != kSeparator)
        child->fullPath += kSeparator;
    child->fullPath += name;
    child->state = state;
    child->foldersOnly = parent.foldersOnly;
    return *(parent.children[name] = std::move(child));
}

void PathTree::insert(std::wstring_view path, PathState state)
{
    std::vector<Node*> way = {&root_};
    for (bool last = false; !last;) {
        Node& node = *way.back();
        const wxString name = text(takeComponent(path, last));
        const auto found = node.children.find(name);
        if (found != node.children.end()) {
            if (last) {
                found->second->state = state;
                removeChildren(*found->second);
            } else {
                way.push_back(found->second.get());
            }
        } else if (node.state == 0 && state == 0) {
            // The rule would change nothing.
            last = true;
        } else {
            // On the way a new node takes its parent's state, so that its other entries go on inheriting the same.
            Node& child = makeChild(node, name, last ? state : node.state);
            if (!last)
                way.push_back(&child);
        }
    }
    for (auto node = way.rbegin(); node != way.rend(); ++node)
        recompute(**node);
}

void PathTree::insertAll(const std::vector<wxString>& paths, PathState state)
{
    for (const wxString& path : paths)
        insert(view(path), state);
}

void PathTree::recompute(Node& node) const
{
    Summary summary;
    for (const auto& [name, child] : node.children) {
        summary.plain |= child->state <= 1 || child->state == 8;
        summary.marked |= child->state >= 2 && child->state <= 7;
        summary.mixed |= child->state >= 2 && child->state <= 5;
    }
    if (node.entryCount == Node::kNotCounted)
        node.entryCount = node.fullPath.empty() ? 0 : counter_(node.fullPath, node.foldersOnly);
    // What is not there or cannot be listed keeps the state it was given; so does the root.
    if (node.entryCount == 0)
        return;
    node.state =
        node.children.size() == node.entryCount ? withoutOthers(node.state, summary) : withOthers(node.state, summary);
}

PathState PathTree::lookup(std::wstring_view path) const
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

void PathTree::forEach(const std::function<void(const wxString& path, PathState state)>& visit) const
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
