#include "core/InstallPaths.h"

#include <gtest/gtest.h>
#include <wx/datetime.h>

#include "core/Options.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(InstallPaths, FollowTheRegistryAtEveryCallAndUnreadableOptionsAreDeletedInSilence)
{
    test::InstalledService service;
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    test::LogCapture log;

    settings.SetValue(L"options.graylist", 0L);
    EXPECT_EQ(readGraylistEnabled(), false);
    settings.SetValue(L"options.graylist", 2L);
    EXPECT_EQ(readGraylistEnabled(), true);
    settings.SetValue(L"options.graylist", wxString(L"1"));
    settings.SetValue(L"options.manifestmtime", 5L);
    EXPECT_TRUE(!readGraylistEnabled() && !readManifestTime());
    EXPECT_FALSE(settings.HasValues()) << "of another type";
    const auto time = wxDateTime(21, wxDateTime::Nov, 2026, 10, 20, 30).GetValue().GetValue();
    for (const wchar_t* text : {L"2026-11-21 10:20:30", L"2026-11-21   10:20:30", L"21 Nov 2026 10:20:30"}) {
        settings.SetValue(L"options.manifestmtime", wxString(text));
        EXPECT_EQ(readManifestTime(), time) << text;
    }
    settings.SetValue(L"options.manifestmtime", wxString(L"soon"));
    EXPECT_FALSE(readManifestTime());
    EXPECT_TRUE(settings.HasValues() && log.take().empty()) << "it could be read as a text, so it stays";

    service.install().SetValue(L"ConfigPath", wxString(L"C:\\conf"));
    service.install().SetValue(L"DataPath", wxString(L"C:\\data"));
    EXPECT_EQ(getDataFilePath(kLogFile) + getDataFilePath(kDataDirectory) + getDataFilePath(8) + getDataFilePath(-1),
              L"C:\\data\\tavi.logC:\\data");
    EXPECT_EQ(getConfigFilePath(0) + getConfigFilePath(2), L"C:\\conf\\taviconf.dat");
    service.install().DeleteValue(L"DataPath");
    EXPECT_EQ(getDataFilePath(kStateDatabase), L"\\tavistate.dat");
}

} // namespace
} // namespace tavi
