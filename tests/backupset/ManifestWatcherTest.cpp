#include "backupset/ManifestWatcher.h"

#include <stdexcept>
#include <vector>

#include <gtest/gtest.h>
#include <wx/log.h>

namespace tavi {
namespace {

// The times are what the service's setting says, round by round; the third load is invalid and the fourth fails.
class ScriptedServices : public WatcherServices {
  public:
    const Manifest* loadManifest() override
    {
        ++loads;
        if (loads == 4)
            throw std::runtime_error("no manifest");
        return loads == 3 ? nullptr : Manifest::Parse(wxString::Format("USER\n_hash|%d", loads));
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        const std::int64_t times[] = {-1, 1000, 1001, 1999, 2000, 9000, 9000};
        milliseconds = rounds < std::size(times) ? times[rounds] : -1;
        ++rounds;
        return milliseconds >= 0;
    }
    std::int64_t now() override
    {
        return 1000 * loads;
    }
    void sleep(std::uint32_t milliseconds) override
    {
        slept += milliseconds;
        --naps;
    }
    bool isStopping() override
    {
        return naps <= 0;
    }
    void buildExclusions(bool firstLoad) override
    {
        builds.push_back(firstLoad ? -1 : static_cast<int>(rounds));
        throw std::runtime_error("must not end the watcher");
    }

    WatcherState state;
    int naps = 0, loads = 0;
    std::uint32_t rounds = 0, slept = 0;
    std::vector<int> builds;
};

TEST(ManifestWatcher, ReloadsForALaterTimeRebuildsEvery18thRoundAndStopsWithinANap)
{
    const wxLogNull quiet;
    // The n-th load is at n seconds, and a load does not take over the time that the service wrote.
    ScriptedServices services;
    services.naps = 10 * 55 + 3;
    RunManifestWatcher(services.state, services);
    EXPECT_EQ(services.loads, 4);
    EXPECT_EQ(services.rounds, 55u);
    EXPECT_EQ(services.slept, 55u * 5000 + 1500);
    EXPECT_EQ(services.builds, (std::vector<int>{-1, 18, 36, 54}));
    // The invalid and the failing one leave the one in force.
    const ManifestRef current(services.state.manifest.acquire());
    EXPECT_EQ(current ? current->hash() : wxString("none"), L"2");

    ScriptedServices stopped;
    RunManifestWatcher(stopped.state, stopped);
    EXPECT_EQ(stopped.loads, 1); // the first load is not skipped
    EXPECT_EQ(stopped.slept, 0u);
    // A second run finds the manifest of the first: it loads a changed one only. The third round's time is later.
    for (const int loads : {1, 1, 2, 2}) {
        RunManifestWatcher(stopped.state, stopped);
        EXPECT_EQ(stopped.loads, loads) << stopped.rounds;
    }
}

} // namespace
} // namespace tavi
