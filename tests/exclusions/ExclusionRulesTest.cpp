#include "exclusions/ExclusionRules.h"

#include <gtest/gtest.h>

using namespace tavi;

using Texts = std::vector<wxString>;
using Text = std::optional<wxString>;

// Answers with the question, shortened, so that the rules show what was asked. Two sources have no answer.
TEST(ExclusionRules, AreTheMachinesAndThenTheUsersPlacesInOrder)
{
    ExclusionSources sources;
    sources.mountPoints = [] { return std::set<wxString>{L"", L"C:\\", L"D:\\m\\"}; };
    sources.registryText = [](auto& key, auto& value) {
        return value == L"ActiveXCache" ? Text() : Text(key.AfterLast(L'\\') + L"." + value);
    };
    sources.registryTexts = [](auto& key, auto& name) { return Texts{key.Right(7) + name + L" 1 2", L"p 0 0", L"0"}; };
    sources.specialFolder = [](SpecialFolder folder) {
        return folder == SpecialFolder::programFiles32 ? Text()
                                                       : Text(L"#" + std::to_wstring(static_cast<int>(folder)));
    };
    sources.temporaryFolder = [] { return L"tmp"; };
    sources.windowsFolder = [] { return L"W"; };
    sources.dollarEntries = [](auto& folder) { return Texts{L"$b" + folder, L"$a"}; };
    sources.serviceDataFolder = [] { return L"data"; };
    sources.userFolders = [](auto& name) { return name == L"Cache" ? Texts() : Texts{name + L"1", name + L"2"}; };
    sources.exists = [](auto& folder) { return folder.Contains("1") == folder.Contains("Outlook"); };
    sources.keepsUserPlaces = [] { return false; };
    std::string rules;
    addMachineRules(sources, [&](const wxString& path, FolderState state) {
        rules += path.utf8_string() + (state == FolderState::off ? "+|" : state == FolderState::allOn ? "|" : "?");
    });
    EXPECT_EQ(rules, R"(C:\System Volume Information|C:\RECYCLER|C:\MSOCache|C:\Config.msi|C:\hiberfil.sys|)"
                     R"(D:\m\System Volume Information|D:\m\RECYCLER|D:\m\MSOCache|D:\m\Config.msi|)"
                     R"(D:\m\hiberfil.sys|agementPagingFiles|p||W\PrefetchParameters.RootDirPath|tmp|W\Temp|)"
                     R"(W\assembly|W\$bW|W\$a|data|#10|CD Burning1|CD Burning2|SchedulingAgent.TasksFolder|)"
                     R"(Recording.RecordPath\TempRec|#47|Cookies1|Cookies2|History1|History2|Local Settings1|)"
                     R"(Local Settings2|Local AppData1|Local AppData1\Microsoft\Outlook+|Local AppData2|)"
                     R"(Local AppData2\Microsoft\Media Player+|Local AppData2\Identities+|NetHood1|NetHood2|)"
                     R"(PrintHood1|PrintHood2|Recent1|Recent2|#37|#36|#43|#44|#38|#38\Intuit\QuickBooks+|)"
                     R"(#38\Intuit\QuickBooks Pro+|#38\Intuit\Quicken+|#38\Quicken+|#38\Qualcomm\Eudora+|#38\Palm+|)"
                     R"(#38\palmOne+|#38\Sony Handheld+|)");
}
