#include "core/Options.h"

#include <gtest/gtest.h>
#include <wx/datetime.h>

#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(Options, UnreadableValuesAreDeletedInSilence)
{
    test::InstalledService service;
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    test::LogCapture log;
    for (const long value : {0, 2}) {
        settings.SetValue(L"options.graylist", value);
        EXPECT_EQ(readGraylistEnabled(), value != 0);
    }
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
    EXPECT_TRUE(settings.HasValues() && log.take().empty()) << "a text, though no time, stays";
}

} // namespace
} // namespace tavi
