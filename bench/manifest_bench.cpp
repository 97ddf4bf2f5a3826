#include <random>
#include <stdexcept>

#include <windows.h>

#include "manifest/StoredManifest.h"
#include "bench/Bench.h"
#include "bench/ManifestGenerator.h"
#include "core/Utf8.h"

namespace tavi::bench {
namespace {

constexpr double kMegabyte = 1e6;

std::string nameOf(std::uint32_t files, FileOrder order)
{
    return ", " + std::to_string(files) + (order == FileOrder::kWalk ? " files, walk order" : " files, random order");
}

void loadFigures(Bench& bench, std::uint32_t files, FileOrder order)
{
    const std::string set = nameOf(files, order);
    const StoredText text = storedText(bench.dataFolder(), files, order);
    std::vector<char> blob = readBlob(text.file);
    ManifestRef manifest;
    // A small set is loaded in less time than the scheduler may take from it: many rounds.
    const int repetitions = bench.repetitions() * (files < 100000 ? 15 : 1);
    const auto times =
        medianSeconds(repetitions, {[&] { inflateOnly(blob, text.textBytes); },
                                    [&] { manifest = whole(parseStoredManifest(blob.data(), blob.size()), files); },
                                    [&] { manifest = ManifestRef(); }});
    bench.report(
        {"blob to manifest / inflating" + set, times[1] / times[0], order == FileOrder::kWalk ? 1.6 : 1.8, "x"});
    bench.report({"blob to manifest" + set, times[1] * 1e3, kNoBound, "ms"});
    bench.report({"destroying" + set, times[2] * 1e3, kNoBound, "ms"});
}

// Bytes over the idle process: at the peak of the first load, after it without the blob, at the peak of the second load
// with the first manifest held; and the address space of the process.
std::vector<double> measureMemory(const std::vector<std::string>& arguments)
{
    const std::uint32_t files = static_cast<std::uint32_t>(std::stoul(arguments[1]));
    const double idle = workingSet();
    std::vector<double> numbers;
    const ManifestRef held = loadSet(arguments[0], files);
    numbers.push_back(peakWorkingSet() - idle);
    numbers.push_back(workingSet() - idle);
    numbers.push_back(static_cast<double>(held->residentBytes()));
    const ManifestRef next = loadSet(arguments[0], files);
    numbers.push_back(peakWorkingSet() - idle);
    MEMORYSTATUSEX memory{};
    memory.dwLength = sizeof memory;
    GlobalMemoryStatusEx(&memory);
    numbers.push_back(static_cast<double>(memory.ullTotalVirtual));
    return numbers;
}
const Child memoryChild("manifest-memory", measureMemory);

void memoryFigures(Bench& bench, std::uint32_t files, FileOrder order)
{
    const std::string set = nameOf(files, order);
    const StoredText text = storedText(bench.dataFolder(), files, order);
    const auto bytes = bench.inOwnProcess("manifest-memory", {text.file, std::to_string(files)});
    const double textBytes = static_cast<double>(text.textBytes);
    bench.report({"peak of a load, blob included / text" + set, bytes[0] / textBytes, 1.05, "x"});
    bench.report({"resident after a load, without the blob / text" + set, bytes[1] / textBytes, 0.55, "x"});
    bench.report({"the manifest's own count of it / text" + set, bytes[2] / textBytes, kNoBound, "x"});
    bench.report({"peak of a reload, old manifest held / text" + set, bytes[3] / textBytes, 1.6, "x"});
    bench.report({"peak of a reload" + set, bytes[3] / kMegabyte, kNoBound, "MB"});
    // A file manager may be given no more than this: a bench that had more would prove nothing about it.
    bench.report({"address space" + set, bytes[4] / kMegabyte, 2048 * 1.048576, "MB"});
}

void questionFigures(Bench& bench, std::uint32_t files)
{
    constexpr std::size_t kQuestions = 50000;
    constexpr std::size_t kSelection = 1000;
    const ManifestRef manifest = loadSet(storedText(bench.dataFolder(), files, FileOrder::kWalk).file, files);
    std::mt19937 random(1);
    std::vector<std::wstring> paths, folders, partial, missing;
    for (std::size_t i = 0; i < kQuestions; ++i) {
        const std::string path = generatedPath(static_cast<std::uint32_t>(random()) % files);
        paths.push_back(fromUtf8(path).ToStdWstring());
        folders.push_back(paths.back().substr(0, kPathLength - kFolderCut));
        partial.push_back(paths.back().substr(0, kPathLength - 5));
        missing.push_back(folders.back() + L"nothing");
    }
    std::size_t answers = 0;
    const auto under = [&](const std::vector<std::wstring>& all, std::size_t count) {
        for (std::size_t i = 0; i < count; ++i)
            answers += manifest->hasBackedUpUnder(all[i], kAnyTime) ? 1u : 0u;
    };
    const auto times = medianSeconds(bench.repetitions(), {
                                                              [&] {
                                                                  for (const auto& path : paths)
                                                                      answers += manifest->findPatches(path) ? 1u : 0u;
                                                              },
                                                              [&] { under(folders, kQuestions); },
                                                              [&] { under(partial, kQuestions); },
                                                              [&] { under(missing, kQuestions); },
                                                              [&] { under(folders, kSelection); },
                                                          });
    if (answers != (3 * kQuestions + kSelection) * static_cast<std::size_t>(bench.repetitions()))
        throw std::runtime_error("wrong answers");
    const std::string at = ", " + std::to_string(files) + " files";
    bench.report({"exact lookup" + at, times[0] / kQuestions * 1e6, 2, "us"});
    bench.report({"prefix question, a folder" + at, times[1] / kQuestions * 1e6, 5, "us"});
    bench.report({"prefix question, part of a name" + at, times[2] / kQuestions * 1e6, 5, "us"});
    bench.report({"prefix question, nothing there" + at, times[3] / kQuestions * 1e6, 5, "us"});
    bench.report({"selection of 1000 folders" + at, times[4] * 1e3, 4, "ms"});
}

void manifestBench(Bench& bench)
{
    const std::uint32_t most = bench.quick() ? 100000 : 1000000;
    for (std::uint32_t files = 10000; files <= most; files *= 10) {
        loadFigures(bench, files, FileOrder::kWalk);
        loadFigures(bench, files, FileOrder::kRandom);
    }
    memoryFigures(bench, most, FileOrder::kWalk);
    memoryFigures(bench, most, FileOrder::kRandom);
    if (!bench.quick())
        memoryFigures(bench, 2 * most, FileOrder::kWalk);
    questionFigures(bench, most);
}
const Group manifestGroup("manifest", manifestBench);

} // namespace
} // namespace tavi::bench
