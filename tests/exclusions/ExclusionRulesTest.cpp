#include "exclusions/ExclusionRules.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

// Answers with the question, shortened, so that the rules show what was asked.
ExclusionSources namedSources()
{
    ExclusionSources sources;
    sources.mountPoints = [] { return std::set<wxString>{L"", L"C:\\", L"D:\\m\\"}; };
    sources.registryText = [](auto& key, auto& value) { return key.AfterLast(L'\\') + L"." + value; };
    sources.registryTexts = [](auto& key, auto& value) {
        return std::vector<wxString>{key.AfterLast(L'\\') + L" " + value + L" 1 2", L"C:\\p.sys 0 0", L"none"};
    };
    sources.specialFolder = [](SpecialFolder folder) { return L"#" + std::to_wstring(static_cast<int>(folder)); };
    sources.temporaryFolder = [] { return L"tmp"; };
    sources.windowsFolder = [] { return L"W"; };
    sources.dollarEntries = [](auto& folder) { return std::vector<wxString>{L"$b" + folder, L"$a"}; };
    sources.serviceDataFolder = [] { return L"data"; };
    sources.userFolders = [](auto& name) { return std::vector<wxString>{name + L"1", name + L"2"}; };
    sources.exists = [](const wxString& folder) {
        return folder.Contains("1") ? folder.Contains("Outlook")
                                    : folder.Contains("ui") || folder.Contains("Identities");
    };
    sources.keepsUserPlaces = [] { return false; };
    return sources;
}

// Returns the paths of the rules. Those that are carved out end in a plus sign.
std::string rulesOf(const ExclusionSources& sources)
{
    std::string text;
    addMachineRules(sources, [&](const wxString& path, FolderState state) {
        text += path.utf8_string() + (state == FolderState::off ? "+|" : state == FolderState::allOn ? "|" : "?");
    });
    return text;
}

TEST(ExclusionRules, AreTheMachinesAndThenTheUsersPlacesInOrder)
{
    EXPECT_EQ(rulesOf(namedSources()),
              R"(C:\System Volume Information|C:\RECYCLER|C:\MSOCache|C:\Config.msi|C:\hiberfil.sys|)"
              R"(D:\m\System Volume Information|D:\m\RECYCLER|D:\m\MSOCache|D:\m\Config.msi|D:\m\hiberfil.sys|)"
              R"(Memory Management PagingFiles|C:\p.sys||W\PrefetchParameters.RootDirPath|tmp|W\Temp|W\assembly|)"
              R"(W\$bW|W\$a|data|#10|CD Burning1|CD Burning2|Cache1|Cache2|Internet Settings.ActiveXCache|)"
              R"(SchedulingAgent.TasksFolder|Recording.RecordPath\TempRec|)"
              R"(#47|Cookies1|Cookies2|History1|History2|Local Settings1|Local Settings2|Local AppData1|)"
              R"(Local AppData1\Microsoft\Outlook+|Local AppData2|Local AppData2\Identities+|NetHood1|NetHood2|)"
              R"(PrintHood1|PrintHood2|Recent1|Recent2|#37|#36|#43|#44|#38|#38\Intuit\QuickBooks+|)"
              R"(#38\Intuit\QuickBooks Pro+|#38\Intuit\Quicken+|#38\Quicken+|#42|#42\Intuit\QuickBooks+|)"
              R"(#42\Intuit\QuickBooks Pro+|#42\Intuit\Quicken+|#42\Quicken+|)");
}

TEST(ExclusionRules, SkipSourcesWithoutAnAnswer)
{
    ExclusionSources sources = namedSources();
    sources.mountPoints = [] { return std::set<wxString>(); };
    sources.registryText = [](auto&, auto&) { return std::nullopt; };
    sources.specialFolder = [](SpecialFolder) { return std::nullopt; };
    sources.temporaryFolder = [] { return std::nullopt; };
    sources.serviceDataFolder = [] { return L""; };
    sources.userFolders = [](auto&) { return std::vector<wxString>(); };
    EXPECT_EQ(rulesOf(sources), R"(Memory Management PagingFiles|C:\p.sys||W\Temp|W\assembly|W\$bW|W\$a|)");
}

} // namespace
} // namespace tavi
