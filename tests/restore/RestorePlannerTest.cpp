#include "restore/RestorePlanner.h"

#include <algorithm>
#include <sstream>

#include <gtest/gtest.h>

#include "core/Utf8.h"
#include "tests/manifest/ManifestSupport.h"

namespace tavi {
namespace {

// Slashes stand for backslashes in what follows.
wxString windows(std::string text)
{
    std::replace(text.begin(), text.end(), '/', '\\');
    return fromUtf8(text);
}

TEST(RestorePlanner, ChoosesVersionsTargetsAndFreeNames)
{
    std::string files = "FILES\n"
                        "C:/W/a/b.txt\n10:1:2:100:0:x:0:40\n20:3:4:200:0:x:0:41\n30:0:0:-1:0:x:0:0\n\n"
                        "C:/W/a.txt\n10:5:6:7:0:x:0:40\n\n"
                        "C:/W/a.txt.bak\n20:5:6:8:0:x:0:40\n20:5:6:9:0:x:0:40\n\n"
                        "C:/W2/late\n25:5:6:1:0:x:0:40\n\n"
                        "C:/W/日é\n10:5:6:1099511627776:0:x:0:40\n\n"
                        "E:/😀é/x\n10:5:6:3:0:x:0:40";
    for (const char* const name : {"report.txt", "README", ".profile", "ends."})
        files += std::string("\n\nD:/dotted.dir/") + name + "\n1:1:1:4:0:x:0:40";
    const ManifestRef manifest = Manifest::parse(windows(files));
    // The selection, the time, the source prefix, the destination, whether to overwrite, how many targets exist, and
    // the rows, each as "path size@timestamp" or "path > target size@timestamp".
    const std::tuple<const char*, std::uint32_t, const char*, const char*, bool, int, const char*> cases[] = {
        // before the first change, just before and just after a deletion
        {"C:/W/a/b.txt", 9, "C:/W/a", "", true, 0, ""},
        {"C:/W/a/b.txt", 29, "", "", false, 0, "C:/W/a/b.txt 200@20"},
        {"C:/W/a/b.txt", 30, "", "", true, 0, ""},
        // the comparison adds no separator, so longer names come along; of equal times the newest decides
        {"C:/W/a.txt", ~0u, "", "", true, 0, "C:/W/a.txt 7@10\nC:/W/a.txt.bak 9@20"},
        {"C:/W", 29, "C:/W", "D:/", true, 0,
         "C:/W2/late > D:/2/late 1@25\nC:/W/a.txt > D://a.txt 7@10\nC:/W/a.txt.bak > D://a.txt.bak 9@20\n"
         "C:/W/日é > D://日é 1099511627776@10\nC:/W/a/b.txt > D://a/b.txt 200@20"},
        {"C:/W/日é", 10, "C:/W/日", "D:/x", true, 0, "C:/W/日é > D:/xé 1099511627776@10"},
        {"C:/W/日é", 10, "C:/W/日é", "D:/chosen", true, 0, "C:/W/日é > D:/chosen 1099511627776@10"},
        {"E:", 10, "E:/😀", "D:/x", true, 0, "E:/😀é/x > D:/xé/x 3@10"},
        {"C:/W2", 25, "", "D:/x", true, 0, "C:/W2/late 1@25"}, // a destination counts with a prefix only
        {"C:/W2 C:/W2/late", 25, "", "", true, 0, "C:/W2/late 1@25\nC:/W2/late 1@25"},
        {"D:/dotted.dir/README", 1, "D:", "E:", false, 1, "D:/dotted.dir/README > E:/dotted.dir/README (1) 4@1"},
        {"D:/dotted.dir/.", 1, "D:", "", false, 1, "D:/dotted.dir/.profile > D:/dotted.dir/ (1).profile 4@1"},
        {"D:/dotted.dir/ends.", 1, "", "", false, 1, "D:/dotted.dir/ends. > D:/dotted.dir/ends (1). 4@1"},
        {"D:/dotted.dir/rep", 1, "", "", false, 9999, "D:/dotted.dir/report.txt > D:/dotted.dir/report (9999).txt 4@1"},
        // the last one is used unasked
        {"D:/dotted.dir/rep", 1, "", "", false, 10000,
         "D:/dotted.dir/report.txt > D:/dotted.dir/report (10000).txt 4@1"},
    };
    for (const auto& [selected, cutoff, prefix, destination, overwrite, taken, expected] : cases) {
        RestoreRequest request{{}, cutoff, windows(prefix), windows(destination), overwrite, L"", L"", L""};
        std::istringstream paths(selected);
        for (std::string path; paths >> path;)
            request.selectedPaths.insert(windows(path));
        int asked = 0;
        const RestorePlan plan = planRestore(request, *manifest, [&, most = taken](const std::string&) {
            EXPECT_TRUE(!request.overwrite && asked <= 9999) << "asked in vain";
            return asked++ < most;
        });
        std::string rows;
        RestoreFileEntry entry;
        for (std::uint32_t row = 0; row < plan.size(); ++row) {
            plan.readEntry(row, entry);
            EXPECT_EQ(entry.overwrite, overwrite);
            rows += (row == 0 ? "" : "\n") + entry.manifestPath;
            if (entry.targetPath != entry.manifestPath)
                rows += " > " + entry.targetPath;
            rows += " " + std::to_string(entry.fileSize) + "@" + std::to_string(entry.timestamp);
        }
        std::replace(rows.begin(), rows.end(), '\\', '/');
        EXPECT_EQ(rows, expected) << selected << " at " << cutoff;
    }
}

} // namespace
} // namespace tavi
