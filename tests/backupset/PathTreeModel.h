#pragma once

#include <map>
#include <string>

#include "backupset/PathTree.h"

namespace tavi::test {

// The same rules over a flat list of full paths, with every question answered by looking through all of it.
class PathTreeModel {
  public:
    explicit PathTreeModel(EntryCounter counter) : counter_(std::move(counter)) {}

    void insert(const std::wstring& path, PathState state)
    {
        for (std::size_t end = path.find(L'\\');; end = path.find(L'\\', end + 1)) {
            const std::wstring here = path.substr(0, end), above = parent(here);
            const PathState inherited = above.empty() ? 0 : nodes_[above];
            const bool last = end == std::wstring::npos;
            const bool changes = nodes_.count(here) != 0 || inherited != 0 || state != 0;
            if (last && changes) {
                for (auto node = nodes_.begin(); node != nodes_.end();)
                    node = node->first.rfind(here + L"\\", 0) == 0 ? nodes_.erase(node) : std::next(node);
                nodes_[here] = state;
            }
            if (last || !changes)
                return summarize(above);
            nodes_.emplace(here, inherited);
        }
    }
    PathState lookup(const std::wstring& path) const
    {
        for (std::wstring at = path; !at.empty(); at = parent(at)) {
            const auto node = nodes_.find(at);
            if (node == nodes_.end())
                continue;
            const PathState own = node->second;
            return at == path || own > 8 ? own : static_cast<PathState>("878747678"[own] - '0');
        }
        return 8;
    }

  private:
    static std::wstring parent(const std::wstring& path)
    {
        const std::size_t end = path.rfind(L'\\');
        return end == std::wstring::npos ? std::wstring() : path.substr(0, end);
    }
    void summarize(std::wstring path)
    {
        for (; !path.empty(); path = parent(path)) {
            bool plain = false, marked = false, mixed = false;
            std::uint32_t children = 0;
            for (const auto& [other, state] : nodes_) {
                if (parent(other) != path)
                    continue;
                ++children;
                plain |= state == 0 || state == 1 || state == 8;
                marked |= state >= 2 && state <= 7;
                mixed |= state >= 2 && state <= 5;
            }
            const std::uint32_t entries = counter_(path, false);
            // Columns: nothing, plain, marked, both, mixed, mixed and plain. Rows: own states 0 to 9.
            static const char* const others[] = {"002222", "757333", "002222", "757333", "646444",
                                                 "757555", "646444", "757555", "002222", "000000"};
            static const char* const whole[] = {"006222", "117333", "006222", "117333", "006222",
                                                "117333", "006222", "117333", "006222", "000000"};
            PathState& own = nodes_[path];
            const PathState row = own > 8 ? 9 : own;
            const int column = (mixed ? 4 : marked ? 2 : 0) + plain;
            if (entries > 0)
                own = static_cast<PathState>((children == entries ? whole : others)[row][column] - '0');
        }
    }

    EntryCounter counter_;
    std::map<std::wstring, PathState> nodes_;
};

} // namespace tavi::test
