#include "statedb/RestorePlanner.h"

#include <set>
#include <vector>

#include <gtest/gtest.h>

#include "core/Text.h"

namespace tavi {
namespace {

ManifestRef manifestOf(const wxString& files)
{
    const Manifest* manifest = Manifest::Parse(L"FILES\n" + files);
    manifest->AddRef();
    return ManifestRef(manifest);
}

const wchar_t kFiles[] = L"C:\\W\\a\\b.txt\n10:1:2:100:0:x:0:40\n20:3:4:200:0:x:0:41\n30:0:0:-1:0:x:0:0\n\n"
                         L"C:\\W\\a.txt\n10:5:6:7:0:x:0:40\n\n"
                         L"C:\\W\\a.txt.bak\n20:5:6:8:0:x:0:40\n20:5:6:9:0:x:0:40\n\n"
                         L"C:\\W2\\late\n25:5:6:1:0:x:0:40\n\n"
                         L"C:\\W\\\x65E5\xE9\n10:5:6:1099511627776:0:x:0:40";

// Each row as "manifest path > target size@timestamp".
std::vector<std::string> planned(const RestoreRequest& request, const std::set<std::wstring>& existing = {})
{
    const ManifestRef manifest = manifestOf(kFiles);
    const RestorePlan plan = planRestore(request, *manifest, [&](const wxString& path) {
        EXPECT_FALSE(request.overwrite) << "asked in vain";
        return existing.count(path.ToStdWstring()) != 0;
    });
    std::vector<std::string> rows;
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row) {
        plan.readEntry(row, entry);
        EXPECT_EQ(entry.overwrite, request.overwrite);
        rows.push_back(entry.manifestPath + " > " + entry.targetPath + " " + std::to_string(entry.fileSize) + "@" +
                       std::to_string(entry.timestamp));
    }
    return rows;
}

TEST(RestorePlanner, ChoosesVersionsAndTargets)
{
    const std::string asian = "\xE6\x97\xA5\xC3\xA9";
    const struct {
        std::vector<std::wstring> selected;
        std::uint32_t cutoff;
        std::wstring prefix, destination;
        bool overwrite;
        std::vector<std::string> rows;
    } cases[] = {
        // in place, at three times: before the first change, in between, after a deletion
        {{L"C:\\W\\a\\b.txt"}, 9, L"C:\\W\\a", L"", true, {}},
        {{L"C:\\W\\a\\b.txt"}, 19, L"", L"", true, {"C:\\W\\a\\b.txt > C:\\W\\a\\b.txt 100@10"}},
        {{L"C:\\W\\a\\b.txt"}, 29, L"", L"", false, {"C:\\W\\a\\b.txt > C:\\W\\a\\b.txt 200@20"}},
        {{L"C:\\W\\a\\b.txt"}, 30, L"", L"", true, {}},
        // the comparison adds no separator, so longer names come along; of equal times the newest decides
        {{L"C:\\W\\a.txt"},
         ~0u,
         L"",
         L"",
         true,
         {"C:\\W\\a.txt > C:\\W\\a.txt 7@10", "C:\\W\\a.txt.bak > C:\\W\\a.txt.bak 9@20"}},
        {{L"C:\\W"},
         29,
         L"C:\\W",
         L"D:\\",
         true,
         {"C:\\W2\\late > D:\\2\\late 1@25", "C:\\W\\a.txt > D:\\\\a.txt 7@10",
          "C:\\W\\a.txt.bak > D:\\\\a.txt.bak 9@20", "C:\\W\\" + asian + " > D:\\\\" + asian + " 1099511627776@10",
          "C:\\W\\a\\b.txt > D:\\\\a\\b.txt 200@20"}},
        {{L"C:\\W\\\x65E5\xE9"},
         10,
         L"C:\\W\\\x65E5",
         L"D:\\x",
         true,
         {"C:\\W\\" + asian + " > D:\\x\xC3\xA9 1099511627776@10"}},
        {{L"C:\\W\\\x65E5\xE9"},
         10,
         L"C:\\W\\\x65E5\xE9",
         L"D:\\chosen",
         true,
         {"C:\\W\\" + asian + " > D:\\chosen 1099511627776@10"}},
        // a destination counts with a prefix only
        {{L"C:\\W2"}, 25, L"", L"D:\\x", true, {"C:\\W2\\late > C:\\W2\\late 1@25"}},
        {{L"C:\\W2", L"C:\\W2\\late"},
         25,
         L"",
         L"",
         true,
         {"C:\\W2\\late > C:\\W2\\late 1@25", "C:\\W2\\late > C:\\W2\\late 1@25"}},
        {{L"c:\\w2"}, 25, L"", L"", true, {}},
        {{}, 25, L"", L"", true, {}},
    };
    for (const auto& test : cases) {
        RestoreRequest request;
        request.selectedPaths.insert(test.selected.begin(), test.selected.end());
        request.cutoffTime = test.cutoff;
        request.sourcePrefix = test.prefix;
        request.destinationFolder = test.destination;
        request.overwrite = test.overwrite;
        EXPECT_EQ(planned(request), test.rows) << (test.selected.empty() ? "" : toUtf8(test.selected.front()));
    }
}

TEST(RestorePlanner, FindsFreeNames)
{
    const struct {
        const wchar_t* name;
        int taken;
        const char* target;
    } cases[] = {{L"report.txt", 0, "report.txt"},
                 {L"report.txt", 1, "report (1).txt"},
                 {L"report.txt", 2, "report (2).txt"},
                 {L"report.txt", 9999, "report (9999).txt"},
                 {L"report.txt", 10000, "report (10000).txt"},
                 {L"report.txt", 10001, "report (10000).txt"}, // the last one is used unasked
                 {L"a.tar.gz", 1, "a.tar (1).gz"},
                 {L"README", 1, "README (1)"},
                 {L".profile", 1, ".profile (1)"},
                 {L"ends.", 1, "ends (1)."}};
    for (const auto& test : cases) {
        const wxString path = wxString(L"C:\\dotted.dir\\") + test.name;
        const ManifestRef manifest = manifestOf(path + L"\n1:1:1:1:0:x:0:40");
        RestoreRequest request;
        request.selectedPaths.insert(path);
        request.cutoffTime = 1;
        int asked = 0;
        const RestorePlan plan = planRestore(request, *manifest, [&](const wxString&) { return asked++ < test.taken; });
        RestoreFileEntry entry;
        ASSERT_EQ(plan.size(), 1u);
        plan.readEntry(0, entry);
        EXPECT_EQ(entry.targetPath, std::string("C:\\dotted.dir\\") + test.target);
    }
}

} // namespace
} // namespace tavi
