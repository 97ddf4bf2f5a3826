#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>
#include <string_view>

#include "fuzz/PathTreeModel.h"

namespace {

using namespace tavi;

constexpr std::size_t kMostRules = 40;
constexpr unsigned kStates = 10; // 9 is no known state
constexpr unsigned kDeepest = 6;
constexpr const char* kNames = "abc";

// Reads the input byte by byte. Returns 0 after the end.
class Bytes {
  public:
    Bytes(const std::uint8_t* bytes, std::size_t length) : left_(reinterpret_cast<const char*>(bytes), length) {}
    bool empty() const
    {
        return left_.empty();
    }
    std::uint8_t next()
    {
        if (left_.empty())
            return 0;
        const auto byte = static_cast<std::uint8_t>(left_.front());
        left_.remove_prefix(1);
        return byte;
    }

  private:
    std::string_view left_;
};

} // namespace

// Inserts the same rules into the tree and its model, and compares their states. The first byte seeds the entry counts.
// Each rule has a byte for state and depth, and a byte for each name of its path.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t length)
{
    Bytes input(bytes, length);
    const EntryCounter counter = test::arbitraryEntryCounts(input.next());
    const RefPtr<PathTree> tree = PathTree::create(false, counter);
    test::PathTreeModel model(counter);
    std::set<std::wstring> asked;
    for (std::size_t rule = 0; rule < kMostRules && !input.empty(); ++rule) {
        const std::uint8_t head = input.next();
        std::wstring path;
        for (unsigned depth = head / kStates % kDeepest + 1; depth-- > 0;) {
            path += (path.empty() ? L"" : L"\\");
            path += static_cast<wchar_t>(kNames[input.next() % 3]);
            asked.insert({path, path + L"\\a", path + L"\\c\\b"});
        }
        tree->insert(path, FolderState{head % kStates});
        model.insert(path, head % kStates);
    }
    for (const std::wstring& question : asked) {
        if (tree->lookup(question) != FolderState{model.lookup(question)})
            std::abort();
    }
    return 0;
}
