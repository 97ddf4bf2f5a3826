#include "restore/RestorePlanner.h"

#include <algorithm>

#include <gtest/gtest.h>

#include "core/Utf8.h"

using namespace tavi;

// Here slashes stand for backslashes.
static wxString windows(std::string text)
{
    std::replace(text.begin(), text.end(), '/', '\\');
    return fromUtf8(text);
}

// Expects these rows, each as "path size@timestamp" or "path > target size@timestamp", if so many targets exist.
static void check(const char* label, const std::vector<std::string>& selected, std::uint32_t cutoff, const char* prefix,
                  const char* destination, bool overwrite, int existingTargets, const std::string& expected)
{
    std::string files = "FILES\n"
                        "C:/W/a/b.txt\n10:1:2:100:0:x:0:40\n20:3:4:200:0:x:0:41\n30:0:0:-1:0:x:0:0\n\n"
                        "C:/W/a.txt\n10:5:6:7:0:x:0:40\n\nC:/W/a.txt.bak\n20:5:6:8:0:x:0:40\n20:5:6:9:0:x:0:40\n\n"
                        "C:/W2/late\n25:5:6:1:0:x:0:40\n\nE:/😀é/x\n10:5:6:3:0:x:0:40\n\n"
                        "C:/W/日é\n10:5:6:1099511627776:0:x:0:40";
    for (const char* const name : {"report.txt", "README", ".profile", "ends."})
        files += std::string("\n\nD:/dotted.dir/") + name + "\n1:1:1:4:0:x:0:40";
    const ManifestRef manifest = Manifest::parse(windows(files));
    RestoreRequest request{{}, cutoff, windows(prefix), windows(destination), overwrite, {}, {}, {}};
    for (const std::string& path : selected)
        request.selectedPaths.insert(windows(path));
    int probes = 0;
    const RestorePlan plan = planRestore(request, *manifest, [&](const std::string&) {
        EXPECT_TRUE(!overwrite && probes <= 9999) << label << ": a needless probe";
        return probes++ < existingTargets;
    });
    std::string rows;
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row) {
        plan.readEntry(row, entry);
        const std::string target = entry.targetPath == entry.manifestPath ? "" : " > " + entry.targetPath;
        rows += entry.manifestPath + target + " " + std::to_string(entry.fileSize) + "@" +
                std::to_string(entry.timestamp) + "\n";
    }
    EXPECT_EQ(windows(rows), windows(expected.empty() ? "" : expected + "\n")) << label;
}

TEST(RestorePlanner, ChoosesTheVersionsOfTheTime)
{
    check("before the first version", {"C:/W/a/b.txt"}, 9, "C:/W/a", "", true, 0, "");
    check("time 0, which is 1970", {"C:/W/a/b.txt"}, 0, "", "", true, 0, "");
    check("before a deletion", {"C:/W/a/b.txt"}, 29, "", "", false, 0, "C:/W/a/b.txt 200@20");
    check("at a deletion", {"C:/W/a/b.txt"}, 30, "", "", true, 0, "");
    check("longer names, newest of one time", {"C:/W/a.txt"}, ~0u, "", "", true, 0,
          "C:/W/a.txt 7@10\nC:/W/a.txt.bak 9@20");
    check("a path selected twice", {"C:/W2", "C:/W2/late"}, 25, "", "", true, 0, "C:/W2/late 1@25\nC:/W2/late 1@25");
}

TEST(RestorePlanner, ReplacesTheSourcePrefixByTheDestination)
{
    check("every path", {"C:/W"}, 29, "C:/W", "D:/", true, 0,
          "C:/W2/late > D:/2/late 1@25\nC:/W/a.txt > D://a.txt 7@10\nC:/W/a.txt.bak > D://a.txt.bak 9@20\n"
          "C:/W/日é > D://日é 1099511627776@10\nC:/W/a/b.txt > D://a/b.txt 200@20");
    check("part of a name", {"C:/W/日é"}, 10, "C:/W/日", "D:/x", true, 0, "C:/W/日é > D:/xé 1099511627776@10");
    check("a whole path", {"C:/W/日é"}, 10, "C:/W/日é", "D:/c", true, 0, "C:/W/日é > D:/c 1099511627776@10");
    check("a surrogate pair", {"E:"}, 10, "E:/😀", "D:/x", true, 0, "E:/😀é/x > D:/xé/x 3@10");
    check("a destination without a prefix", {"C:/W2"}, 25, "", "D:/x", true, 0, "C:/W2/late 1@25");
}

TEST(RestorePlanner, FindsAFreeName)
{
    const std::string in = "D:/dotted.dir/";
    check("no dot", {in + "README"}, 1, "D:", "E:", false, 1, in + "README > E:/dotted.dir/README (1) 4@1");
    check("dot first", {in + "."}, 1, "D:", "", false, 1, in + ".profile > " + in + " (1).profile 4@1");
    check("dot last", {in + "ends."}, 1, "", "", false, 1, in + "ends. > " + in + "ends (1). 4@1");
    check("last probed", {in + "rep"}, 1, "", "", false, 9999, in + "report.txt > " + in + "report (9999).txt 4@1");
    check("last of all", {in + "rep"}, 1, "", "", false, 10000, in + "report.txt > " + in + "report (10000).txt 4@1");
}
