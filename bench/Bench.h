#pragma once

#include <functional>
#include <limits>
#include <string>
#include <vector>

// The benchmarks' frame: groups register themselves, measure, and report figures against their bounds. What depends on
// the machine is stated as a ratio of two things measured in one run.
namespace tavi::bench {

constexpr double kNoBound = std::numeric_limits<double>::infinity();

struct Figure {
    std::string name;
    double value;
    double bound;
    std::string unit;
};

class Bench {
  public:
    Bench(std::string dataFolder, bool quick) : dataFolder_(std::move(dataFolder)), quick_(quick) {}

    // Generated data is kept here from run to run.
    const std::string& dataFolder() const
    {
        return dataFolder_;
    }
    bool quick() const
    {
        return quick_;
    }
    int repetitions() const
    {
        return quick_ ? 3 : 7;
    }
    // Prints the figure as a line of the table.
    void report(const Figure& figure);
    bool allWithinBounds() const
    {
        return allWithinBounds_;
    }

    // Runs `child` with these arguments in a process of its own, so that what it measures of the process is its own
    // doing. The numbers that it returns come back. Any thread.
    std::vector<double> inOwnProcess(const std::string& child, const std::vector<std::string>& arguments);

  private:
    std::string dataFolder_;
    bool quick_;
    bool allWithinBounds_ = true;
};

using ChildBody = std::vector<double> (*)(const std::vector<std::string>& arguments);

// Static objects of these register a group, and a body for inOwnProcess.
struct Group {
    Group(const char* name, void (*run)(Bench&));
};
struct Child {
    Child(const char* name, ChildBody body);
};

// Runs the works in turn, so often; the median of each, in seconds.
std::vector<double> medianSeconds(int repetitions, const std::vector<std::function<void()>>& works);

// Working set of this process, now and at its highest, in bytes.
double workingSet();
double peakWorkingSet();

} // namespace tavi::bench
