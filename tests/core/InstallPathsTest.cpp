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
    EXPECT_FALSE(readManifestTime());
    test::InstalledService service;
    wxRegKey settings(GetSettingsKeyName());
    settings.Create();
    test::LogCapture log;

    for (const long value : {2L, 0L}) {
        settings.SetValue(L"options.graylist", value);
        EXPECT_EQ(readGraylistEnabled(), value != 0);
    }
    settings.SetValue(L"options.graylist", wxString(L"1"));
    EXPECT_EQ(readGraylistEnabled(), std::nullopt);
    EXPECT_FALSE(settings.HasValue(L"options.graylist"));

    settings.SetValue(L"options.manifestmtime", 5L);
    EXPECT_EQ(readManifestTime(), std::nullopt);
    EXPECT_FALSE(settings.HasValue(L"options.manifestmtime"));
    const auto time = wxDateTime(21, wxDateTime::Nov, 2026, 10, 20, 30).GetValue().GetValue();
    for (const wchar_t* text : {L"2026-11-21 10:20:30", L"2026-11-21   10:20:30", L"21 Nov 2026 10:20:30", L"soon"}) {
        settings.SetValue(L"options.manifestmtime", wxString(text));
        EXPECT_EQ(readManifestTime(), text == wxString("soon") ? std::nullopt : std::make_optional(time)) << text;
    }
    // It could be read as a text, so it stays.
    EXPECT_TRUE(settings.HasValue(L"options.manifestmtime"));
    EXPECT_TRUE(log.take().empty());

    service.install().SetValue(L"ConfigPath", wxString(L"C:\\conf"));
    service.install().SetValue(L"DataPath", wxString(L"C:\\data"));
    EXPECT_EQ(GetDataFilePath(kLogFile) + GetDataFilePath(kDataDirectory) + GetDataFilePath(8) + GetDataFilePath(-1),
              L"C:\\data\\tavi.logC:\\data");
    EXPECT_EQ(GetConfigFilePath(0) + GetConfigFilePath(2), L"C:\\conf\\taviconf.dat");
    service.install().DeleteValue(L"DataPath");
    EXPECT_EQ(GetDataFilePath(kStateDatabase), L"\\tavistate.dat");
}

} // namespace
} // namespace tavi
