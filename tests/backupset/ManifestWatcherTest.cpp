#include "backupset/ManifestWatcher.h"

#include <set>
#include <stdexcept>
#include <vector>

#include <gtest/gtest.h>
#include <wx/log.h>

namespace tavi {
namespace {

// Drives the watcher by a script of rounds: before round n its time is what the service's setting says.
class ScriptedServices : public WatcherServices {
  public:
    explicit ScriptedServices(WatcherState& state, std::vector<std::int64_t> times, int naps)
        : state_(state), times_(std::move(times)), naps_(naps)
    {
    }
    const Manifest* loadManifest() override
    {
        ++loads;
        if (failing.count(loads))
            throw std::runtime_error("no manifest");
        return invalid.count(loads) ? nullptr : Manifest::Parse(wxString::Format("USER\n_hash|%d", loads));
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        const std::size_t round = rounds++;
        milliseconds = round < times_.size() ? times_[round] : -1;
        return milliseconds >= 0;
    }
    std::int64_t now() override
    {
        return 1000 * loads;
    }
    void sleep(std::uint32_t milliseconds) override
    {
        slept += milliseconds;
        if (--naps_ == 0)
            state_.stopFlag = 1;
    }
    void buildExclusions(bool firstLoad) override
    {
        builds.push_back(firstLoad ? -1 : static_cast<int>(rounds));
        throw std::runtime_error("must not end the watcher");
    }

    int loads = 0;
    std::size_t rounds = 0;
    std::uint32_t slept = 0;
    std::vector<int> builds;
    std::set<int> invalid, failing;

  private:
    WatcherState& state_;
    std::vector<std::int64_t> times_;
    int naps_;
};

wxString currentHash(WatcherState& state)
{
    const ManifestRef current(state.manifest.acquire());
    return current ? current->hash() : wxString("none");
}

TEST(ManifestWatcher, ReloadsWhenTheServiceIsStrictlyLater)
{
    const wxLogNull quiet;
    // The n-th load is at n seconds, and a load does not take over the time that the service wrote.
    WatcherState state;
    ScriptedServices services(state, {-1, 1000, 1001, 1999, 2000, 9000, 9000}, 10 * 8 + 3);
    services.invalid = {3};
    services.failing = {4};
    RunManifestWatcher(state, services);
    EXPECT_EQ(services.loads, 4);
    EXPECT_EQ(currentHash(state), L"2"); // an invalid or failing one leaves the one in force
    EXPECT_EQ(services.rounds, 8u);
    EXPECT_EQ(services.slept, 8u * 5000 + 1500);
    EXPECT_EQ(services.builds, std::vector<int>{-1});
}

TEST(ManifestWatcher, RebuildsTheExclusionsEvery18thRoundAndStopsWithinANap)
{
    const wxLogNull quiet;
    WatcherState state;
    ScriptedServices services(state, {}, 10 * 55 + 1);
    RunManifestWatcher(state, services);
    EXPECT_EQ(services.builds, (std::vector<int>{-1, 18, 36, 54}));
    EXPECT_EQ(services.loads, 1);

    state.stopFlag = 1;
    ScriptedServices stopped(state, {}, 0);
    RunManifestWatcher(state, stopped);
    EXPECT_EQ(stopped.loads, 1); // the first load is not skipped
    EXPECT_EQ(stopped.slept, 0u);
}

} // namespace
} // namespace tavi
