#include <cstdint>
#include <cstdio>
#include <iterator>

#include <windows.h>

#include "core/Module.h"
#include "core/RefCounted.h"
#include "core/Utf8.h"
#include "exclusions/Graylist.h"

namespace {

using namespace tavi;

const char* meaning(std::uint32_t state)
{
    static constexpr const char* kMeanings[] = {"backed up",
                                                "left out, but not what is listed below",
                                                "backed up, some below left out",
                                                "left out, some below backed up",
                                                "backed up, nearly all below left out",
                                                "left out, some below backed up",
                                                "backed up, all below left out",
                                                "left out",
                                                "backed up"};
    return state < std::size(kMeanings) ? kMeanings[state] : "unknown";
}

} // namespace

// Prints the places that a backup leaves out by default.
int wmain()
{
    setModuleInstance(GetModuleHandleW(nullptr));
    const auto tree = RefPtr<const PathTree>::adopt(getGraylist(true));
    std::printf("state  path, and what becomes of it\n");
    tree->forEach([](const wxString& path, FolderState state) {
        const auto number = static_cast<std::uint32_t>(state);
        std::printf("  %u    %s: %s\n", static_cast<unsigned>(number), toUtf8(view(path)).c_str(), meaning(number));
    });
    return 0;
}
