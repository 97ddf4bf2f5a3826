#include <stdexcept>

#include <sqlite3.h>

#include "manifest/ManifestWatcher.h"
#include "bench/Bench.h"
#include "bench/BenchInstall.h"
#include "bench/ManifestGenerator.h"

namespace tavi::bench {
namespace {

void store(const std::vector<char>& blob)
{
    const std::string path = toUtf8(view(getDataFilePath(kStateDatabase)));
    sqlite3* database = nullptr;
    sqlite3_stmt* insert = nullptr;
    const bool stored =
        sqlite3_open(path.c_str(), &database) == SQLITE_OK &&
        sqlite3_exec(database, "CREATE TABLE manifest(contents BLOB)", nullptr, nullptr, nullptr) == SQLITE_OK &&
        sqlite3_prepare_v2(database, "INSERT INTO manifest VALUES(?)", -1, &insert, nullptr) == SQLITE_OK &&
        sqlite3_bind_blob(insert, 1, blob.data(), static_cast<int>(blob.size()), SQLITE_STATIC) == SQLITE_OK &&
        sqlite3_step(insert) == SQLITE_DONE;
    sqlite3_finalize(insert);
    sqlite3_close(database);
    if (!stored)
        throw std::runtime_error("cannot store the bench set");
}

std::vector<double> measureLoad(const std::vector<std::string>& arguments)
{
    const double idle = workingSet();
    const auto files = static_cast<std::uint32_t>(std::stoul(arguments[0]));
    const ManifestRef held = whole(readStoredManifest(), files);
    const double first = peakWorkingSet() - idle;
    const ManifestRef next = whole(readStoredManifest(), files);
    return {first, peakWorkingSet() - idle};
}
const Child loadChild("database-memory", measureLoad);

void databaseBench(Bench& bench)
{
    const std::uint32_t files = bench.quick() ? 100000 : 1000000;
    const StoredText text = storedText(bench.dataFolder(), files, FileOrder::kWalk);
    const std::string at = ", " + std::to_string(files) + " files";
    const BenchInstall install(bench.dataFolder() + "/stored");
    {
        std::vector<char> blob = readBlob(text.file);
        store(blob);
        ManifestRef manifest;
        const auto times =
            medianSeconds(bench.quick() ? 3 : 5, {
                                                     [&] { inflateOnly(blob, text.textBytes); },
                                                     [&] { manifest = whole(readStoredManifest(), files); },
                                                     [&] { manifest = ManifestRef(); },
                                                 });
        bench.report({"database to manifest / inflating" + at, times[1] / times[0], 2.5, "x"});
    }
    const auto bytes = bench.inOwnProcess("database-memory", {std::to_string(files)});
    const auto textBytes = static_cast<double>(text.textBytes);
    bench.report({"peak of a load from the database / text" + at, bytes[0] / textBytes, 1.05, "x"});
    bench.report({"peak of a reload from the database / text" + at, bytes[1] / textBytes, 1.6, "x"});
}
const Group databaseGroup("database", databaseBench);

} // namespace
} // namespace tavi::bench
