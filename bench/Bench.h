#pragma once

#include <cstdint>
#include <functional>
#include <limits>
#include <string>
#include <vector>

// The frame of the benchmarks. A group measures, and reports figures with their upper bounds. A bounded time is a ratio
// of two measurements of one run, so that the speed of the machine does not count.
namespace tavi::bench {

constexpr double kNoBound = std::numeric_limits<double>::infinity();

struct Bench {
    // The folder that keeps generated data from run to run.
    const std::string dataFolder;
    // Smaller sets and fewer repetitions.
    const bool quick;
    const int repetitions = quick ? 3 : 7;
    // The number of files of the largest set that every run has.
    const std::uint32_t files = quick ? 100000 : 1000000;
    bool allWithinBounds = true;

    // Prints a row of the table and compares the value with its bound.
    void report(const std::string& name, double value, double bound, const char* unit);
    // Runs a child in a new process, whose memory and processor time are only its own. Returns the numbers that the
    // child returns. Any thread.
    std::vector<double> inOwnProcess(const std::string& child, const std::vector<std::string>& arguments) const;
};

// The groups, and the children that inOwnProcess runs.
void runDatabase(Bench& bench);
void runExclusions(Bench& bench);
void runLink(Bench& bench);
void runManifest(Bench& bench);
void runMenu(Bench& bench);
void runRestore(Bench& bench);
using Arguments = std::vector<std::string>;
std::vector<double> measureIdle(const Arguments& arguments);
std::vector<double> measureManifest(const Arguments& arguments);
std::vector<double> measurePlanning(const Arguments& arguments);

// Both functions run all works in turn, as often as `repetitions` says, so that a busy second of the machine affects
// all.
using Works = std::vector<std::function<void()>>;
// Returns the median of each in seconds, waits included.
std::vector<double> medianSeconds(int repetitions, const Works& works);
// Returns the least processor time of each in seconds, which excludes waits and the time of other processes. Each turn
// runs a work again until it has taken many steps of the clock.
std::vector<double> leastProcessorSeconds(int repetitions, const Works& works);

// Returns the user and kernel time of this process in seconds. Its clock may advance in steps of kClockStepSeconds.
double processorSeconds();
constexpr double kClockStepSeconds = 0.01;

// The working set of this process in bytes.
struct WorkingSet {
    double now;
    double peak;
};
WorkingSet workingSet();

} // namespace tavi::bench
