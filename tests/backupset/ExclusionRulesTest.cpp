#include "backupset/ExclusionRules.h"

#include <map>
#include <sstream>

#include <gtest/gtest.h>

namespace tavi {
namespace {

// Answers with the question, shortened, so that the rules tell what was asked; `without` has no answer at all.
class NamedSources : public ExclusionSources {
  public:
    std::string without;
    bool keeps = false;

    std::set<wxString> mountPoints() override
    {
        return without == "volumes" ? std::set<wxString>() : std::set<wxString>{L"", L"C:\\", L"D:\\m\\"};
    }
    std::optional<wxString> registryText(const wxString& key, const wxString& value) override
    {
        return without == "registry" ? std::nullopt : std::optional(key.AfterLast(L'\\') + L"." + value);
    }
    std::vector<wxString> registryTexts(const wxString& key, const wxString& value) override
    {
        if (without == "registry")
            return {};
        return {key.AfterLast(L'\\') + L" " + value + L" 1 2", L"C:\\p.sys 0 0", L"none"};
    }
    std::optional<wxString> specialFolder(int number) override
    {
        return without == "folders" ? std::nullopt : std::optional(L"#" + std::to_wstring(number));
    }
    std::optional<wxString> temporaryFolder() override
    {
        return without == "temp" ? std::nullopt : std::optional<wxString>(L"tmp");
    }
    wxString windowsFolder() override
    {
        return L"W";
    }
    std::vector<wxString> dollarEntries(const wxString& folder) override
    {
        return {L"$b" + folder, L"$a"};
    }
    wxString serviceDataFolder() override
    {
        return without == "data" ? L"" : L"data";
    }
    std::vector<wxString> userFolders(const wxString& name) override
    {
        return without == "users" ? std::vector<wxString>() : std::vector<wxString>{name + L"1", name + L"2"};
    }
    bool exists(const wxString& folder) override
    {
        return folder.Contains("1") ? folder.Contains("Outlook")
                                    : folder.Contains("ui") || folder.Contains("Identities");
    }
    bool keepsUserPlaces() override
    {
        return keeps;
    }
};

// What was carved out ends in a plus sign.
std::string rulesOf(NamedSources& sources)
{
    std::string text;
    addMachineRules(sources, [&](const wxString& path, PathState state) {
        EXPECT_TRUE(state == 7 || state == 0);
        text += path.utf8_string() + (state == 0 ? "+|" : "|");
    });
    return text;
}

const std::string kVolumes =
    R"(C:\System Volume Information|C:\RECYCLER|C:\MSOCache|C:\Config.msi|C:\hiberfil.sys|)"
    R"(D:\m\System Volume Information|D:\m\RECYCLER|D:\m\MSOCache|D:\m\Config.msi|D:\m\hiberfil.sys|)";
const std::string kPaging = R"(Memory Management PagingFiles|C:\p.sys||)";
const std::string kUsers =
    R"(#47|Cookies1|Cookies2|History1|History2|Local Settings1|Local Settings2|Local AppData1|)"
    R"(Local AppData1\Microsoft\Outlook+|Local AppData2|Local AppData2\Identities+|NetHood1|NetHood2|)"
    R"(PrintHood1|PrintHood2|Recent1|Recent2|#37|#36|#43|#44|#38|#38\Intuit\QuickBooks+|)"
    R"(#38\Intuit\QuickBooks Pro+|#38\Intuit\Quicken+|#38\Quicken+|#42|#42\Intuit\QuickBooks+|)"
    R"(#42\Intuit\QuickBooks Pro+|#42\Intuit\Quicken+|#42\Quicken+|)";

TEST(ExclusionRules, StandInOrderAndEachSourceMayBeMissing)
{
    NamedSources sources;
    const std::string machine =
        kVolumes + kPaging + R"(W\PrefetchParameters.RootDirPath|tmp|W\Temp|W\assembly|W\$bW|W\$a|data|#10|)" +
        "CD Burning1|CD Burning2|Cache1|Cache2|Internet Settings.ActiveXCache|SchedulingAgent.TasksFolder|" +
        R"(Recording.RecordPath\TempRec|)";
    EXPECT_EQ(rulesOf(sources), machine + kUsers);
    sources.keeps = true;
    EXPECT_EQ(rulesOf(sources), machine);
    // Nothing but the rows of the source that is missing goes.
    const std::pair<const char*, std::vector<std::string>> cases[] = {
        {"volumes", {kVolumes}},
        {"registry",
         {kPaging, R"(W\PrefetchParameters.RootDirPath|)", "Internet Settings.ActiveXCache|",
          "SchedulingAgent.TasksFolder|", R"(Recording.RecordPath\TempRec|)"}},
        {"folders", {"#10|"}},
        {"temp", {"tmp|"}},
        {"data", {"data|"}},
        {"users", {"CD Burning1|CD Burning2|Cache1|Cache2|"}},
    };
    for (const auto& [source, rows] : cases) {
        std::string expected = machine;
        for (const std::string& row : rows)
            expected.erase(expected.find(row), row.length());
        sources.without = source;
        EXPECT_EQ(rulesOf(sources), expected) << source;
    }
    sources.keeps = false;
    sources.without = "folders";
    EXPECT_EQ(rulesOf(sources).find("Intuit"), std::string::npos) << "below a folder that is not there";
}

} // namespace
} // namespace tavi
