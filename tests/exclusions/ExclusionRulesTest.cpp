#include "exclusions/ExclusionRules.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

// Answers with the question, shortened, so that the rules tell what was asked; without `has` it has no answer to give.
class NamedSources : public ExclusionSources {
  public:
    bool has = true, keeps = false;

    std::set<wxString> mountPoints() override
    {
        return has ? std::set<wxString>{L"", L"C:\\", L"D:\\m\\"} : std::set<wxString>{};
    }
    std::optional<wxString> registryText(const wxString& key, const wxString& value) override
    {
        return has ? std::optional(key.AfterLast(L'\\') + L"." + value) : std::nullopt;
    }
    std::vector<wxString> registryTexts(const wxString& key, const wxString& value) override
    {
        return {key.AfterLast(L'\\') + L" " + value + L" 1 2", L"C:\\p.sys 0 0", L"none"};
    }
    std::optional<wxString> specialFolder(int number) override
    {
        return has ? std::optional(L"#" + std::to_wstring(number)) : std::nullopt;
    }
    std::optional<wxString> temporaryFolder() override
    {
        return has ? std::optional<wxString>(L"tmp") : std::nullopt;
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
        return has ? L"data" : L"";
    }
    std::vector<wxString> userFolders(const wxString& name) override
    {
        return {name + L"1", name + L"2"};
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
    addMachineRules(sources, [&](const wxString& path, FolderState state) {
        text += path.utf8_string() + (state == FolderState::off ? "+|" : state == FolderState::allOn ? "|" : "?");
    });
    return text;
}

TEST(ExclusionRules, StandInOrderAndEachSourceMayBeMissing)
{
    NamedSources sources;
    const std::string machine =
        R"(C:\System Volume Information|C:\RECYCLER|C:\MSOCache|C:\Config.msi|C:\hiberfil.sys|)"
        R"(D:\m\System Volume Information|D:\m\RECYCLER|D:\m\MSOCache|D:\m\Config.msi|D:\m\hiberfil.sys|)"
        R"(Memory Management PagingFiles|C:\p.sys||W\PrefetchParameters.RootDirPath|tmp|W\Temp|W\assembly|)"
        R"(W\$bW|W\$a|data|#10|CD Burning1|CD Burning2|Cache1|Cache2|Internet Settings.ActiveXCache|)"
        R"(SchedulingAgent.TasksFolder|Recording.RecordPath\TempRec|)";
    EXPECT_EQ(rulesOf(sources),
              machine +
                  R"(#47|Cookies1|Cookies2|History1|History2|Local Settings1|Local Settings2|Local AppData1|)"
                  R"(Local AppData1\Microsoft\Outlook+|Local AppData2|Local AppData2\Identities+|NetHood1|NetHood2|)"
                  R"(PrintHood1|PrintHood2|Recent1|Recent2|#37|#36|#43|#44|#38|#38\Intuit\QuickBooks+|)"
                  R"(#38\Intuit\QuickBooks Pro+|#38\Intuit\Quicken+|#38\Quicken+|#42|#42\Intuit\QuickBooks+|)"
                  R"(#42\Intuit\QuickBooks Pro+|#42\Intuit\Quicken+|#42\Quicken+|)");
    sources.keeps = true;
    EXPECT_EQ(rulesOf(sources), machine);
    // Nothing is added for a source without an answer, nor below a folder that is not there.
    sources.has = sources.keeps = false;
    EXPECT_EQ(rulesOf(sources),
              R"(Memory Management PagingFiles|C:\p.sys||W\Temp|W\assembly|W\$bW|W\$a|CD Burning1|CD Burning2|)"
              R"(Cache1|Cache2|Cookies1|Cookies2|History1|History2|Local Settings1|Local Settings2|Local AppData1|)"
              R"(Local AppData1\Microsoft\Outlook+|Local AppData2|Local AppData2\Identities+|NetHood1|NetHood2|)"
              R"(PrintHood1|PrintHood2|Recent1|Recent2|)");
}

} // namespace
} // namespace tavi
