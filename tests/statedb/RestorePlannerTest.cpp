#include "statedb/RestorePlanner.h"

#include <algorithm>
#include <sstream>

#include <gtest/gtest.h>

#include "core/Text.h"
#include "tests/backupset/ManifestSupport.h"

namespace tavi {
namespace {

// Slashes stand for backslashes in what follows.
wxString windows(std::string text)
{
    std::replace(text.begin(), text.end(), '/', '\\');
    return fromUtf8(text);
}

ManifestRef manifestOf(const std::string& files)
{
    return test::held(Manifest::Parse(windows("FILES\n" + files)));
}

// Each row as "path size@timestamp", or "path > target size@timestamp" where they differ; newlines between.
std::string planned(const RestoreRequest& request, const ManifestRef& manifest)
{
    const RestorePlan plan = planRestore(request, *manifest, [&](const std::string&) {
        EXPECT_FALSE(request.overwrite) << "asked in vain";
        return false;
    });
    std::string rows;
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row) {
        plan.readEntry(row, entry);
        EXPECT_EQ(entry.overwrite, request.overwrite);
        rows += (row == 0 ? "" : "\n") + entry.manifestPath;
        if (entry.targetPath != entry.manifestPath)
            rows += " > " + entry.targetPath;
        rows += " " + std::to_string(entry.fileSize) + "@" + std::to_string(entry.timestamp);
    }
    std::replace(rows.begin(), rows.end(), '\\', '/');
    return rows;
}

TEST(RestorePlanner, ChoosesVersionsAndTargets)
{
    const ManifestRef manifest =
        manifestOf("C:/W/a/b.txt\n10:1:2:100:0:x:0:40\n20:3:4:200:0:x:0:41\n30:0:0:-1:0:x:0:0\n\n"
                   "C:/W/a.txt\n10:5:6:7:0:x:0:40\n\n"
                   "C:/W/a.txt.bak\n20:5:6:8:0:x:0:40\n20:5:6:9:0:x:0:40\n\n"
                   "C:/W2/late\n25:5:6:1:0:x:0:40\n\n"
                   "C:/W/日é\n10:5:6:1099511627776:0:x:0:40\n\n"
                   "E:/😀é/x\n10:5:6:3:0:x:0:40");
    const struct {
        const char* selected;
        std::uint32_t cutoff;
        const char* prefix;
        const char* destination;
        bool overwrite;
        const char* rows;
    } cases[] = {
        // before the first change, between two, after a deletion
        {"C:/W/a/b.txt", 9, "C:/W/a", "", true, ""},
        {"C:/W/a/b.txt", 19, "", "", true, "C:/W/a/b.txt 100@10"},
        {"C:/W/a/b.txt", 29, "", "", false, "C:/W/a/b.txt 200@20"},
        {"C:/W/a/b.txt", 30, "", "", true, ""},
        // the comparison adds no separator, so longer names come along; of equal times the newest decides
        {"C:/W/a.txt", ~0u, "", "", true, "C:/W/a.txt 7@10\nC:/W/a.txt.bak 9@20"},
        {"C:/W", 29, "C:/W", "D:/", true,
         "C:/W2/late > D:/2/late 1@25\nC:/W/a.txt > D://a.txt 7@10\nC:/W/a.txt.bak > D://a.txt.bak 9@20\n"
         "C:/W/日é > D://日é 1099511627776@10\nC:/W/a/b.txt > D://a/b.txt 200@20"},
        {"C:/W/日é", 10, "C:/W/日", "D:/x", true, "C:/W/日é > D:/xé 1099511627776@10"},
        {"C:/W/日é", 10, "C:/W/日é", "D:/chosen", true, "C:/W/日é > D:/chosen 1099511627776@10"},
        {"E:", 10, "E:/😀", "D:/x", true, "E:/😀é/x > D:/xé/x 3@10"},
        {"C:/W2", 25, "", "D:/x", true, "C:/W2/late 1@25"}, // a destination counts with a prefix only
        {"C:/W2 C:/W2/late", 25, "", "", true, "C:/W2/late 1@25\nC:/W2/late 1@25"},
    };
    for (const auto& test : cases) {
        RestoreRequest request;
        std::istringstream selected(test.selected);
        for (std::string path; selected >> path;)
            request.selectedPaths.insert(windows(path));
        request.cutoffTime = test.cutoff;
        request.sourcePrefix = windows(test.prefix);
        request.destinationFolder = windows(test.destination);
        request.overwrite = test.overwrite;
        EXPECT_EQ(planned(request, manifest), test.rows) << test.selected << " at " << test.cutoff;
    }
}

TEST(RestorePlanner, FindsFreeNames)
{
    const std::tuple<std::string, int, std::string> cases[] = {
        {"report.txt", 0, "report.txt"},
        {"report.txt", 1, "report (1).txt"},
        {"report.txt", 9999, "report (9999).txt"},
        {"report.txt", 10000, "report (10000).txt"}, // the last one is used unasked
        {"README", 1, "README (1)"},
        {".profile", 1, " (1).profile"},
        {"ends.", 1, "ends (1)."}};
    for (const auto& [name, taken, target] : cases) {
        const std::string path = "C:/dotted.dir/" + name;
        const ManifestRef manifest = manifestOf(path + "\n1:1:1:1:0:x:0:40");
        RestoreRequest request;
        request.selectedPaths.insert(windows(path));
        request.cutoffTime = 1;
        int asked = 0;
        const RestorePlan plan =
            planRestore(request, *manifest, [&, most = taken](const std::string&) { return asked++ < most; });
        RestoreFileEntry entry;
        ASSERT_EQ(plan.size(), 1u);
        plan.readEntry(0, entry);
        EXPECT_EQ(entry.targetPath, "C:\\dotted.dir\\" + target);
    }
}

} // namespace
} // namespace tavi
