#include <algorithm>
#include <random>
#include <stdexcept>
#include <unordered_set>

#include <windows.h>
#include <zlib.h>

#include "bench/Bench.h"
#include "bench/InstalledService.h"
#include "bench/ManifestGenerator.h"
#include "core/Utf8.h"
#include "manifest/ManifestWatcher.h"
#include "manifest/StoredManifest.h"

namespace tavi::bench {
namespace {

// The manifest is as large in a 64-bit process, but the heap there adds more to it.
constexpr bool k64Bit = sizeof(void*) == 8;

// The least work of any reader: inflates the blob into 64 KB and drops the text. Throws unless it has `expected` bytes.
void inflateOnly(std::vector<char>& blob, std::uint64_t expected)
{
    std::vector<Bytef> out(64 * 1024);
    z_stream stream{};
    inflateInit2(&stream, 15 + 32);
    stream.next_in = reinterpret_cast<Bytef*>(blob.data());
    stream.avail_in = static_cast<uInt>(blob.size());
    std::uint64_t total = 0;
    for (int status = Z_OK; status == Z_OK; total += out.size() - stream.avail_out) {
        stream.next_out = out.data();
        stream.avail_out = static_cast<uInt>(out.size());
        status = inflate(&stream, Z_NO_FLUSH);
    }
    inflateEnd(&stream);
    if (total != expected)
        throw std::runtime_error("the generated set does not inflate");
}

// Returns the processor time, in seconds, of inflating the blob and of loading its manifest.
std::vector<double> loadTimes(const Bench& bench, const StoredText& text, std::vector<char>& blob,
                              const std::function<ManifestRef()>& load)
{
    return leastProcessorSeconds(bench.repetitions, {[&] { inflateOnly(blob, text.textBytes); }, [&] { load(); }});
}

void loadFigures(Bench& bench, std::uint32_t files, FileOrder order)
{
    const StoredText text = storedText(bench.dataFolder, files, order);
    std::vector<char> blob = readBlob(text.file);
    const BlobPieces pieces = piecesOf({blob.data(), blob.size()});
    const auto load = [&] { return checked(parseStoredManifest(pieces), files); };
    const auto times = loadTimes(bench, text, blob, load);
    bench.report("blob to manifest / inflating" + text.title, times[1] / times[0], order == FileOrder::walk ? 1.6 : 1.8,
                 "x");
    bench.report("blob to manifest" + text.title, times[1] * 1e3, kNoBound, "ms");
}

void memoryFigures(Bench& bench, std::uint32_t files, FileOrder order)
{
    const StoredText text = storedText(bench.dataFolder, files, order);
    const auto bytes = bench.inOwnProcess("manifest", {std::to_string(files), text.file});
    const double textBytes = static_cast<double>(text.textBytes);
    bench.report("peak of a load, blob included / text" + text.title, bytes[0] / textBytes, 1.05, "x");
    bench.report("resident after a load, without the blob / text" + text.title, bytes[1] / textBytes,
                 k64Bit ? 0.6 : 0.55, "x");
    bench.report("peak of a reload, old manifest held / text" + text.title, bytes[2] / textBytes, 1.6, "x");
    bench.report("peak of a reload" + text.title, bytes[2] / 1e6, kNoBound, "MB");
    // A 32-bit file manager may have no more than this, so its figures above must not come from a larger address space.
    if (!k64Bit)
        bench.report("address space" + text.title, bytes[3] / 1e6, 2048 * 1.048576, "MB");
}

void questionFigures(Bench& bench)
{
    constexpr std::size_t kQuestions = 50000;
    constexpr std::size_t kSelection = 1000;
    const ManifestRef manifest = loadSet(storedText(bench.dataFolder, bench.files, FileOrder::walk).file, bench.files);
    std::mt19937 random(1);
    std::vector<std::wstring> paths, folders, partial, missing;
    for (std::size_t i = 0; i < kQuestions; ++i) {
        const std::string path = generatedPath(static_cast<std::uint32_t>(random()) % bench.files);
        paths.push_back(fromUtf8(path).ToStdWstring());
        folders.push_back(paths.back().substr(0, kPathLength - kNameLength));
        partial.push_back(paths.back().substr(0, kPathLength - 5));
        missing.push_back(folders.back() + L"nothing");
    }
    // The plain references: a hash table of the same paths and a binary search of them.
    std::vector<std::wstring> sorted;
    for (std::uint32_t file = 0; file < bench.files; ++file)
        sorted.push_back(manifest->filePath(file).ToStdWstring());
    std::sort(sorted.begin(), sorted.end());
    const std::unordered_set<std::wstring_view> table(sorted.begin(), sorted.end());

    std::size_t found = 0, asked = 0;
    const auto ask = [&](const std::vector<std::wstring>& questions, std::size_t count, auto question) {
        return [&, count, question] {
            for (std::size_t i = 0; i < count; ++i)
                found += question(questions[i]) ? 1u : 0u;
            asked += count;
        };
    };
    const auto findPatches = [&](const std::wstring& path) { return manifest->findPatches(path).has_value(); };
    const auto findInTable = [&](const std::wstring& path) { return table.count(path) != 0; };
    const auto isAnyUnder = [&](const std::wstring& prefix) { return manifest->hasBackedUpUnder(prefix, kAnyTime); };
    const auto search = [&](const std::wstring& prefix) {
        const auto first = std::lower_bound(sorted.begin(), sorted.end(), prefix);
        return first != sorted.end() && first->compare(0, prefix.size(), prefix) == 0;
    };
    const auto times = leastProcessorSeconds(bench.repetitions,
                                             {ask(paths, kQuestions, findPatches), ask(paths, kQuestions, findInTable),
                                              ask(folders, kQuestions, isAnyUnder), ask(folders, kQuestions, search),
                                              ask(partial, kQuestions, isAnyUnder), ask(partial, kQuestions, search),
                                              ask(folders, kSelection, isAnyUnder), ask(folders, kSelection, search)});
    const bool allFound = found == asked;
    found = 0;
    const auto absent = leastProcessorSeconds(bench.repetitions,
                                              {ask(missing, kQuestions, isAnyUnder), ask(missing, kQuestions, search)});
    if (!allFound || found != 0)
        throw std::runtime_error("wrong answers");
    const std::string at = ", " + std::to_string(bench.files) + " files";
    bench.report("exact lookup / hash table of the paths" + at, times[0] / times[1], 2, "x");
    bench.report("prefix question, a folder / binary search" + at, times[2] / times[3], 2, "x");
    bench.report("prefix question, part of a name / binary search" + at, times[4] / times[5], 2, "x");
    bench.report("prefix question, nothing there / binary search" + at, absent[0] / absent[1], 2, "x");
    bench.report("selection of 1000 folders / binary search" + at, times[6] / times[7], 2, "x");
    bench.report("exact lookup" + at, times[0] / kQuestions * 1e6, kNoBound, "us");
    bench.report("prefix question, a folder" + at, times[2] / kQuestions * 1e6, kNoBound, "us");
}

} // namespace

// Returns bytes: the peak of a load, the manifest without its blob, and the peak of a second load beside the first
// manifest, all over the idle process; then the address space. Without a file the manifest comes from the database.
std::vector<double> measureManifest(const Arguments& arguments)
{
    const auto files = static_cast<std::uint32_t>(std::stoul(arguments[0]));
    const auto load = [&] {
        return arguments.size() == 1 ? checked(readStoredManifest(), files) : loadSet(arguments[1], files);
    };
    const double idle = workingSet().now;
    const ManifestRef held = load();
    const double peak = workingSet().peak - idle;
    const double resident = workingSet().now - idle;
    const ManifestRef next = load();
    MEMORYSTATUSEX memory{};
    memory.dwLength = sizeof memory;
    GlobalMemoryStatusEx(&memory);
    return {peak, resident, workingSet().peak - idle, static_cast<double>(memory.ullTotalVirtual)};
}

void runDatabase(Bench& bench)
{
    const StoredText text = storedText(bench.dataFolder, bench.files, FileOrder::walk);
    const std::string at = ", " + std::to_string(bench.files) + " files";
    const test::InstalledService service;
    service.createTables();
    std::vector<char> blob = readBlob(text.file);
    service.storeManifest({blob.data(), blob.size()});
    // The first load, whose reads may wait for the disk, is never the least.
    const auto load = [&] { return checked(readStoredManifest(), bench.files); };
    const auto times = loadTimes(bench, text, blob, load);
    bench.report("database to manifest / inflating" + at, times[1] / times[0], 2, "x");
    const auto bytes = bench.inOwnProcess("manifest", {std::to_string(bench.files)});
    const auto textBytes = static_cast<double>(text.textBytes);
    bench.report("peak of a load from the database / text" + at, bytes[0] / textBytes, 1.05, "x");
    bench.report("peak of a reload from the database / text" + at, bytes[2] / textBytes, 1.6, "x");
}

void runManifest(Bench& bench)
{
    for (std::uint32_t files = 10000; files <= bench.files; files *= 10) {
        loadFigures(bench, files, FileOrder::walk);
        loadFigures(bench, files, FileOrder::random);
    }
    memoryFigures(bench, bench.files, FileOrder::walk);
    memoryFigures(bench, bench.files, FileOrder::random);
    if (!bench.quick)
        memoryFigures(bench, 2 * bench.files, FileOrder::walk);
    questionFigures(bench);
}

} // namespace tavi::bench
