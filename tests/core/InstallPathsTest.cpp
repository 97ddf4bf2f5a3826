#include "core/InstallPaths.h"

#include <gtest/gtest.h>
#include <wx/datetime.h>
#include <wx/log.h>

#include "core/Options.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(InstallPaths, FollowTheRegistryAtEveryCall)
{
    const wxLogNull quiet;
    test::InstalledService service;
    service.install().SetValue(L"ConfigPath", wxString(L"C:\\conf"));
    service.install().SetValue(L"DataPath", wxString(L"C:\\data"));
    const wchar_t* const data[] = {L"C:\\data\\tavistate.dat",
                                   L"C:\\data\\tavi.log",
                                   L"C:\\data\\tavilog.dat",
                                   L"C:\\data\\changes.dat",
                                   L"C:\\data\\filter_raw.log",
                                   L"C:\\data\\tavicache.dat",
                                   L"C:\\data\\tavimap.dat",
                                   L"C:\\data",
                                   L""};
    for (int selector = 0; selector < 9; ++selector)
        EXPECT_EQ(GetDataFilePath(selector), data[selector]);
    EXPECT_EQ(GetDataFilePath(-1), L"");
    EXPECT_EQ(GetConfigFilePath(0), L"C:\\conf\\taviconf.dat");
    EXPECT_EQ(GetConfigFilePath(1), L"C:\\conf\\tavikey.dat");
    EXPECT_EQ(GetConfigFilePath(2), L"");

    service.install().DeleteValue(L"DataPath");
    EXPECT_EQ(GetDataFilePath(kDataDirectory), L"");
    EXPECT_EQ(GetDataFilePath(kStateDatabase), L"\\tavistate.dat");
}

TEST(Options, AnUnreadableValueIsDeletedInSilence)
{
    EXPECT_FALSE(readManifestTime());
    test::InstalledService service;
    wxRegKey settings(GetSettingsKeyName());
    settings.Create();
    test::LogCapture log;

    settings.SetValue(L"options.graylist", 2L);
    EXPECT_EQ(readGraylistEnabled(), true);
    settings.SetValue(L"options.graylist", 0L);
    EXPECT_EQ(readGraylistEnabled(), false);
    settings.SetValue(L"options.graylist", wxString(L"1"));
    EXPECT_EQ(readGraylistEnabled(), std::nullopt);
    EXPECT_FALSE(settings.HasValue(L"options.graylist"));
    EXPECT_EQ(readGraylistEnabled(), std::nullopt);

    settings.SetValue(L"options.manifestmtime", 5L);
    EXPECT_EQ(readManifestTime(), std::nullopt);
    EXPECT_FALSE(settings.HasValue(L"options.manifestmtime"));
    const wxDateTime time(21, wxDateTime::Nov, 2026, 10, 20, 30);
    for (const wchar_t* text : {L"2026-11-21 10:20:30", L"2026-11-21   10:20:30", L"21 Nov 2026 10:20:30"}) {
        settings.SetValue(L"options.manifestmtime", wxString(text));
        EXPECT_EQ(readManifestTime(), time.GetValue().GetValue()) << text;
    }
    settings.SetValue(L"options.manifestmtime", wxString(L"soon"));
    EXPECT_EQ(readManifestTime(), std::nullopt);
    // It could be read as a text, so it stays.
    EXPECT_TRUE(settings.HasValue(L"options.manifestmtime"));

    EXPECT_TRUE(log.take().empty());
    EXPECT_TRUE(wxLog::IsEnabled());
}

} // namespace
} // namespace tavi
