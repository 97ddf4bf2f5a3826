#include "core/Options.h"

#include <gtest/gtest.h>

#include "core/Boundary.h"
#include "core/Log.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;

namespace {

struct Options : testing::Test {
    const test::InstalledService service;
    wxRegKey settings = settingsKey();
    const bool isCreated = settings.Create();
    test::LogCapture log;
};

TEST_F(Options, OfAnotherTypeAreDeletedInSilence)
{
    settings.SetValue(L"options.graylist", 2L);
    EXPECT_EQ(readGraylistEnabled(), true);
    settings.SetValue(L"options.graylist", wxString(L"1"));
    settings.SetValue(L"options.manifestmtime", 5L);
    EXPECT_FALSE(readGraylistEnabled());
    EXPECT_FALSE(readManifestTime());
    EXPECT_FALSE(settings.HasValues());
    settings.SetValue(L"options.manifestmtime", wxString(L"soon"));
    EXPECT_FALSE(readManifestTime());
    EXPECT_TRUE(settings.HasValues()) << "a text, though no time, stays";
    EXPECT_EQ(log.takeText(), "");
}

TEST_F(Options, AndPathsAreReadOrGivenUpWhereMemoryRunsOut)
{
    settings.SetValue(L"options.manifestmtime", wxString(L"1970-01-02 00:00:01"));
    std::optional<std::int64_t> time;
    wxString path;
    ASSERT_TRUE(openLog(3)); // whose lines need no memory
    for (const test::Heap heap : {test::Heap::zeroed, test::Heap::c}) {
        path.clear();
        for (int succeeding = 0; path.empty() && succeeding < 1000; ++succeeding) {
            const test::FailingAllocations few(succeeding, heap);
            guarded("time", [&] { time = readManifestTime(); });
            guarded("path", [&] { path = getDataFilePath(DataFile::log); });
        }
    }
    closeLog();
    EXPECT_EQ(time, 86401000);
    EXPECT_EQ(path, service.file(L"tavi.log"));
    EXPECT_TRUE(settings.HasValue(L"options.manifestmtime"));
}

} // namespace
