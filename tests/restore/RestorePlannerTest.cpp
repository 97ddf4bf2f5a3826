#include "restore/RestorePlanner.h"

#include <optional>
#include <set>

#include <gtest/gtest.h>

using namespace tavi;

using Targets = std::set<std::string>;

// Expects these rows, each as "path size@timestamp" or "path > target size@timestamp", if these targets exist. Without
// any of them, files may be overwritten.
static void check(const char* label, const PathSet& selected, std::uint32_t cutoff, const wxString& prefix,
                  const wxString& destination, const std::optional<Targets>& existing, const std::string& expected)
{
    wxString files = L"FILES\n"
                     L"C:\\W\\a\\b.txt\n10:1:2:100:0:x:0:40\n20:3:4:200:0:x:0:41\n30:0:0:-1:0:x:0:0\n\n"
                     L"C:\\W\\a.txt\n10:5:6:7:0:x:0:40\n\nC:\\W\\a.txt.bak\n20:5:6:8:0:x:0:40\n20:5:6:9:0:x:0:40\n\n"
                     L"C:\\W2\\late\n25:5:6:1:0:x:0:40\n\nE:\\😀é\\x\n10:5:6:3:0:x:0:40\n\n"
                     L"C:\\W\\日é\n10:5:6:1099511627776:0:x:0:40";
    for (const char* const path : {"D:\\d.x\\report.txt", "D:\\d.x\\README", "D:\\d.x\\.profile", "D:\\d.x\\ends.",
                                   "F:\\A (2)", "F:\\a", "F:\\a (1)", "F:\\b"})
        files += wxString("\n\n") + path + "\n1:1:1:4:0:x:0:40";
    const ManifestRef manifest = Manifest::parse(files);
    const RestoreRequest request{selected, cutoff, prefix, destination, !existing, {}, {}, {}};
    const RestorePlan plan = planRestore(request, *manifest, [&](const std::string& target) {
        EXPECT_TRUE(existing) << label << ": a needless probe";
        return existing->count(target) != 0;
    });
    std::string rows;
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row) {
        plan.readEntry(row, entry);
        const std::string target = entry.targetPath == entry.manifestPath ? "" : " > " + entry.targetPath;
        rows += entry.manifestPath + target + " " + std::to_string(entry.fileSize) + "@" +
                std::to_string(entry.timestamp) + "\n";
    }
    EXPECT_EQ(rows, expected) << label;
}

TEST(RestorePlanner, ChoosesTheVersionsOfTheTime)
{
    check("before the first version", {L"C:\\W\\a\\b.txt"}, 9, "C:\\W\\a", "", {}, "");
    check("time 0, which is 1970", {L"C:\\W\\a\\b.txt"}, 0, "", "", {}, "");
    check("before a deletion", {L"C:\\W\\a\\b.txt"}, 29, "", "", Targets(), "C:\\W\\a\\b.txt 200@20\n");
    check("at a deletion", {L"C:\\W\\a\\b.txt"}, 30, "", "", {}, "");
    check("longer names, newest of one time", {L"C:\\W\\a.txt"}, ~0u, "", "", {},
          "C:\\W\\a.txt 7@10\nC:\\W\\a.txt.bak 9@20\n");
    check("selected twice", {L"C:\\W2", L"C:\\W2\\late"}, 25, "", "", {}, "C:\\W2\\late 1@25\nC:\\W2\\late 1@25\n");
}

TEST(RestorePlanner, ReplacesTheSourcePrefixByTheDestination)
{
    check("every path", {L"C:\\W"}, 29, "C:\\W", "D:\\", {},
          "C:\\W2\\late > D:\\2\\late 1@25\nC:\\W\\a.txt > D:\\\\a.txt 7@10\nC:\\W\\a.txt.bak > D:\\\\a.txt.bak 9@20\n"
          "C:\\W\\日é > D:\\\\日é 1099511627776@10\nC:\\W\\a\\b.txt > D:\\\\a\\b.txt 200@20\n");
    check("in a name", {L"C:\\W\\日é"}, 10, L"C:\\W\\日", "D:\\x", {}, "C:\\W\\日é > D:\\xé 1099511627776@10\n");
    check("a path", {L"C:\\W\\日é"}, 10, L"C:\\W\\日é", "D:\\c", {}, "C:\\W\\日é > D:\\c 1099511627776@10\n");
    check("a surrogate pair", {L"E:"}, 10, L"E:\\😀", "D:\\x", {}, "E:\\😀é\\x > D:\\xé\\x 3@10\n");
    check("a destination without a prefix", {L"C:\\W2"}, 25, "", "D:\\x", {}, "C:\\W2\\late 1@25\n");
}

TEST(RestorePlanner, FindsAFreeName)
{
    const std::string in = "D:\\d.x\\", report = in + "report.txt > " + in + "report ";
    check("no dot", {L"D:\\d.x\\README"}, 1, "D:", "E:", Targets{"E:\\d.x\\README"},
          in + "README > E:\\d.x\\README (1) 4@1\n");
    check("dot first", {L"D:\\d.x\\."}, 1, "D:", "", Targets{in + ".profile"},
          in + ".profile > " + in + " (1).profile 4@1\n");
    check("dot last", {L"D:\\d.x\\ends."}, 1, "", "", Targets{in + "ends."}, in + "ends. > " + in + "ends (1). 4@1\n");
    Targets existing{in + "report.txt"};
    for (int number = 1; number < 9999; ++number)
        existing.insert(in + "report (" + std::to_string(number) + ").txt");
    check("last probed", {L"D:\\d.x\\rep"}, 1, "", "", existing, report + "(9999).txt 4@1\n");
    for (const int number : {9999, 10000})
        existing.insert(in + "report (" + std::to_string(number) + ").txt");
    check("last of all", {L"D:\\d.x\\rep"}, 1, "", "", existing, report + "(10000).txt 4@1\n");
}

TEST(RestorePlanner, GivesNoNameTwice)
{
    check("a name in the backup, in any case", {L"F:\\"}, 1, "", "", Targets{"F:\\a", "F:\\b"},
          "F:\\A (2) 4@1\nF:\\a > F:\\a (1) 4@1\nF:\\a (1) > F:\\a (1) (1) 4@1\nF:\\b > F:\\b (1) 4@1\n");
    check("a folder, then a file in it", {L"F:\\a", L"F:\\"}, 1, "", "", Targets{"F:\\a (1)"},
          "F:\\A (2) 4@1\nF:\\a 4@1\nF:\\a (1) > F:\\a (1) (1) 4@1\nF:\\b 4@1\n"
          "F:\\a > F:\\a (3) 4@1\nF:\\a (1) > F:\\a (1) (2) 4@1\n");
}
