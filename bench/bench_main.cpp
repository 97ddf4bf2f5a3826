#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <map>
#include <stdexcept>

#include <windows.h>
#include <psapi.h>

#include "bench/Bench.h"
#include "core/Handles.h"

namespace tavi::bench {
namespace {

const std::map<std::string, void (*)(Bench&)> kGroups = {{"database", runDatabase}, {"exclusions", runExclusions},
                                                         {"link", runLink},         {"manifest", runManifest},
                                                         {"menu", runMenu},         {"restore", runRestore}};
const std::map<std::string, std::vector<double> (*)(const Arguments&)> kChildren = {
    {"idle", measureIdle}, {"manifest", measureManifest}, {"planning", measurePlanning}};

} // namespace

void Bench::report(const std::string& name, double value, double bound, const char* unit)
{
    const bool within = value <= bound;
    allWithinBounds = allWithinBounds && within;
    std::printf("%-80s %10.2f ", name.c_str(), value);
    if (bound == kNoBound)
        std::printf("%10s %s\n", "", unit);
    else
        std::printf("%10.2f %-6s %s\n", bound, unit, within ? "ok" : "MISSED");
    std::fflush(stdout);
}

std::vector<double> Bench::inOwnProcess(const std::string& child, const Arguments& arguments) const
{
    char program[MAX_PATH] = "";
    GetModuleFileNameA(nullptr, program, MAX_PATH);
    static std::atomic<int> started{0};
    const std::string resultFile =
        dataFolder + "/child-" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(++started) + ".txt";
    std::string line = '"' + std::string(program) + "\" --child \"" + resultFile + "\" " + child;
    for (const std::string& argument : arguments)
        line += " \"" + argument + '"';

    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION information{};
    if (!CreateProcessA(program, line.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup, &information))
        throw std::runtime_error("cannot start " + line);
    const KernelHandle thread(information.hThread), process(information.hProcess);
    constexpr DWORD kLimitMs = 15 * 60 * 1000;
    if (WaitForSingleObject(process.get(), kLimitMs) != WAIT_OBJECT_0)
        TerminateProcess(process.get(), 1);
    DWORD code = 1;
    GetExitCodeProcess(process.get(), &code);

    std::vector<double> numbers;
    std::ifstream result(resultFile);
    for (double number = 0; result >> number;)
        numbers.push_back(number);
    result.close();
    std::remove(resultFile.c_str());
    if (code != 0 || numbers.empty())
        throw std::runtime_error("failed: " + line);
    return numbers;
}

std::vector<double> medianSeconds(int repetitions, const Works& works)
{
    std::vector<std::vector<double>> times(works.size());
    for (int repetition = 0; repetition < repetitions; ++repetition) {
        for (std::size_t i = 0; i < works.size(); ++i) {
            const auto start = std::chrono::steady_clock::now();
            works[i]();
            times[i].push_back(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
        }
    }
    std::vector<double> medians;
    for (auto& each : times) {
        std::sort(each.begin(), each.end());
        medians.push_back(each[each.size() / 2]);
    }
    return medians;
}

std::vector<double> leastProcessorSeconds(int repetitions, const Works& works)
{
    std::vector<double> least(works.size(), kNoBound);
    for (int repetition = 0; repetition < repetitions; ++repetition) {
        for (std::size_t i = 0; i < works.size(); ++i) {
            const double start = processorSeconds();
            double spent = 0;
            int runs = 0;
            for (; spent < 50 * kClockStepSeconds; ++runs) {
                works[i]();
                spent = processorSeconds() - start;
            }
            least[i] = std::min(least[i], spent / runs);
        }
    }
    return least;
}

double processorSeconds()
{
    FILETIME created, ended, kernel, user;
    GetProcessTimes(GetCurrentProcess(), &created, &ended, &kernel, &user);
    const auto seconds = [](const FILETIME& time) {
        return (time.dwHighDateTime * 4294967296.0 + time.dwLowDateTime) / 1e7;
    };
    return seconds(kernel) + seconds(user);
}

WorkingSet workingSet()
{
    PROCESS_MEMORY_COUNTERS counters{};
    if (!GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof counters))
        throw std::runtime_error("cannot read the memory counters");
    return {static_cast<double>(counters.WorkingSetSize), static_cast<double>(counters.PeakWorkingSetSize)};
}

} // namespace tavi::bench

// tavi_bench DATA-FOLDER [--quick] [GROUP...] runs all groups, or those named. Returns 1 if a figure exceeds its bound,
// 2 on failure. tavi_bench --child RESULT-FILE CHILD [ARGUMENT...] stores the numbers of a child.
int main(int argc, char** argv)
{
    using namespace tavi::bench;
    Arguments arguments(argv + 1, argv + argc);
    try {
        if (arguments.size() >= 3 && arguments[0] == "--child") {
            std::ofstream result(arguments[1]);
            result.precision(17);
            for (const double number : kChildren.at(arguments[2])({arguments.begin() + 3, arguments.end()}))
                result << number << '\n';
            return result ? 0 : 1;
        }
        if (arguments.empty())
            throw std::runtime_error("usage: tavi_bench DATA-FOLDER [--quick] [GROUP...]");
        const auto end = std::remove(arguments.begin(), arguments.end(), "--quick");
        Bench bench{arguments[0], end != arguments.end()};
        const Arguments wanted(arguments.begin() + 1, end);
        std::printf("%-80s %10s %10s %-6s\n", "figure", "value", "bound", "unit");
        for (const std::string& name : wanted)
            kGroups.at(name);
        for (const auto& [name, run] : kGroups) {
            if (wanted.empty() || std::count(wanted.begin(), wanted.end(), name) != 0)
                run(bench);
        }
        return bench.allWithinBounds ? 0 : 1;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "error: %s\n", error.what());
        return 2;
    }
}
