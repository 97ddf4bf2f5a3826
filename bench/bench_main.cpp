#include "bench/Bench.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <map>
#include <stdexcept>

#include <windows.h>

#include <psapi.h>

namespace tavi::bench {
namespace {

std::map<std::string, void (*)(Bench&)>& groups()
{
    static std::map<std::string, void (*)(Bench&)> all;
    return all;
}

std::map<std::string, ChildBody>& children()
{
    static std::map<std::string, ChildBody> all;
    return all;
}

PROCESS_MEMORY_COUNTERS memoryCounters()
{
    PROCESS_MEMORY_COUNTERS counters{};
    counters.cb = sizeof counters;
    if (!GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof counters))
        throw std::runtime_error("no memory counters");
    return counters;
}

int runAsChild(const std::string& resultFile, const std::string& child, const std::vector<std::string>& arguments)
{
    const std::vector<double> numbers = children().at(child)(arguments);
    std::ofstream result(resultFile);
    result.precision(17);
    for (const double number : numbers)
        result << number << '\n';
    return result ? 0 : 1;
}

} // namespace

Group::Group(const char* name, void (*run)(Bench&))
{
    groups()[name] = run;
}

Child::Child(const char* name, ChildBody body)
{
    children()[name] = body;
}

void Bench::report(const Figure& figure)
{
    const bool bounded = figure.bound != kNoBound;
    const bool within = figure.value <= figure.bound;
    allWithinBounds_ = allWithinBounds_ && within;
    char bound[32] = "";
    if (bounded)
        std::snprintf(bound, sizeof bound, "%10.2f", figure.bound);
    std::printf("%-80s %10.2f %10s %-6s %s\n", figure.name.c_str(), figure.value, bound, figure.unit.c_str(),
                !bounded ? ""
                : within ? "ok"
                         : "MISSED");
    std::fflush(stdout);
}

std::vector<double> Bench::inOwnProcess(const std::string& child, const std::vector<std::string>& arguments)
{
    char program[MAX_PATH] = "";
    GetModuleFileNameA(nullptr, program, MAX_PATH);
    static std::atomic<int> started{0};
    const std::string resultFile =
        dataFolder_ + "/child-" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(++started) + ".txt";
    std::string line = '"' + std::string(program) + "\" --child \"" + resultFile + "\" " + child;
    for (const std::string& argument : arguments)
        line += " \"" + argument + '"';

    STARTUPINFOA startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION process{};
    if (!CreateProcessA(program, line.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup, &process))
        throw std::runtime_error("cannot start " + line);
    constexpr DWORD kLimitMs = 15 * 60 * 1000;
    if (WaitForSingleObject(process.hProcess, kLimitMs) != WAIT_OBJECT_0)
        TerminateProcess(process.hProcess, 1);
    DWORD code = 1;
    GetExitCodeProcess(process.hProcess, &code);
    CloseHandle(process.hThread);
    CloseHandle(process.hProcess);

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

std::vector<double> medianSeconds(int repetitions, const std::vector<std::function<void()>>& works)
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

double workingSet()
{
    return static_cast<double>(memoryCounters().WorkingSetSize);
}

double peakWorkingSet()
{
    return static_cast<double>(memoryCounters().PeakWorkingSetSize);
}

} // namespace tavi::bench

// tavi_bench DATA-FOLDER [--quick] [GROUP...]: all groups, or those named. 1 if a figure missed its bound, 2 if one
// could not be had.
int main(int argc, char** argv)
{
    using namespace tavi::bench;
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    try {
        if (arguments.size() >= 3 && arguments[0] == "--child")
            return runAsChild(arguments[1], arguments[2], {arguments.begin() + 3, arguments.end()});
        if (arguments.empty()) {
            std::fputs("usage: tavi_bench DATA-FOLDER [--quick] [GROUP...]\n", stderr);
            return 2;
        }
        const bool quick = std::count(arguments.begin(), arguments.end(), "--quick") != 0;
        Bench bench(arguments[0], quick);
        std::printf("%-80s %10s %10s %-6s\n", "figure", "value", "bound", "unit");
        std::vector<std::string> wanted(arguments.begin() + 1, arguments.end());
        wanted.erase(std::remove(wanted.begin(), wanted.end(), "--quick"), wanted.end());
        for (const std::string& name : wanted)
            groups().at(name);
        for (const auto& [name, run] : groups()) {
            if (wanted.empty() || std::count(wanted.begin(), wanted.end(), name) != 0)
                run(bench);
        }
        return bench.allWithinBounds() ? 0 : 1;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "error: %s\n", error.what());
        return 2;
    }
}
