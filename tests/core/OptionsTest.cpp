#include "core/Options.h"

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

TEST(Options, ValuesOfAnotherTypeAreDeletedInSilence)
{
    const tavi::test::InstalledService service;
    wxRegKey settings = tavi::settingsKey();
    settings.Create();
    tavi::test::LogCapture log;
    settings.SetValue(L"options.graylist", 2L);
    EXPECT_EQ(tavi::readGraylistEnabled(), true);
    settings.SetValue(L"options.graylist", wxString(L"1"));
    settings.SetValue(L"options.manifestmtime", 5L);
    EXPECT_FALSE(tavi::readGraylistEnabled() || tavi::readManifestTime() || settings.HasValues());
    settings.SetValue(L"options.manifestmtime", wxString(L"soon"));
    EXPECT_TRUE(!tavi::readManifestTime() && settings.HasValues()) << "a text, though no time, stays";
    EXPECT_EQ(log.takeText(), "");
}
