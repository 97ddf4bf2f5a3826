#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "exclusions/PathTree.h"

namespace tavi::test {

// Returns a counter of arbitrary numbers, the same for each call with one folder: 0, fewer than the tests have names,
// as many, or more.
inline EntryCounter arbitraryEntryCounts(std::size_t seed)
{
    return [seed](const wxString& folder, bool) {
        std::size_t sum = seed;
        for (const wchar_t character : view(folder))
            sum = sum * 31 + static_cast<std::size_t>(character);
        return static_cast<std::uint32_t>(sum % 1009 % 5);
    };
}

// An independent model of PathTree: a flat list of full paths, all of which are searched for every answer.
class PathTreeModel {
  public:
    // The numeric value of a FolderState.
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
            // One row for each state 0 to 9 of the folder itself. The bits of the column say which states its children
            // have: bit 0 for 0, 1 or 8, bit 1 for 6 or 7, bit 2 for 2 to 5.
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
