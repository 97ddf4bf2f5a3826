#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "exclusions/PathTree.h"

namespace tavi::test {

// The same rules over a flat list of full paths, with every question answered by looking through all of it.
class PathTreeModel {
  public:
    // The number of a FolderState.
    using State = std::uint32_t;

    explicit PathTreeModel(EntryCounter counter) : counter_(std::move(counter)) {}

    void insert(const std::wstring& path, State state)
    {
        for (std::size_t end = path.find(L'\\');; end = path.find(L'\\', end + 1)) {
            const std::wstring here = path.substr(0, end), above = parent(here);
            const State inherits = above.empty() ? 0 : nodes_[above];
            const bool last = end == std::wstring::npos;
            const bool changes = nodes_.count(here) != 0 || inherits != 0 || state != 0;
            if (last && changes) {
                for (auto node = nodes_.begin(); node != nodes_.end();)
                    node = node->first.rfind(here + L"\\", 0) == 0 ? nodes_.erase(node) : std::next(node);
                nodes_[here] = state;
            }
            if (last || !changes)
                return summarize(above);
            nodes_.emplace(here, inherits);
        }
    }
    State lookup(const std::wstring& path) const
    {
        for (std::wstring at = path; !at.empty(); at = parent(at)) {
            if (const auto node = nodes_.find(at); node != nodes_.end())
                return at == path ? node->second : static_cast<State>("8787476789"[node->second] - '0');
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
            std::uint32_t children = 0;
            int column = 0;
            for (const auto& [other, state] : nodes_) {
                if (parent(other) != path)
                    continue;
                ++children;
                column |= "1144442210"[state] - '0';
            }
            const std::uint32_t entries = counter_(path, false);
            // Columns: bit 0 for children of state 0, 1 or 8, bit 1 for 6 or 7, bit 2 for 2 to 5. Rows: own states 0
            // to 9.
            static const char* const others[] = {"00222222", "75733333", "00222222", "75733333", "64644444",
                                                 "75755555", "64644444", "75755555", "00222222", "00000000"};
            static const char* const whole[] = {"00622222", "11733333", "00622222", "11733333", "00622222",
                                                "11733333", "00622222", "11733333", "00622222", "00000000"};
            State& own = nodes_[path];
            if (entries > 0)
                own = static_cast<State>((children == entries ? whole : others)[own][column] - '0');
        }
    }

    EntryCounter counter_;
    std::map<std::wstring, State> nodes_;
};

} // namespace tavi::test
