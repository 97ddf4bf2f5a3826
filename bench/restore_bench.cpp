#include <stdexcept>

#include "bench/Bench.h"
#include "bench/BenchInstall.h"
#include "bench/ManifestGenerator.h"
#include "restore/RestoreRequest.h"

namespace tavi::bench {
namespace {

constexpr std::uint32_t kCutoff = 0xFFFFFFFE;

RestoreRequest everything(const Manifest& manifest)
{
    RestoreRequest request;
    request.selectedPaths.insert(manifest.filePath(0).Left(3));
    request.cutoffTime = kCutoff;
    request.overwrite = true;
    return request;
}

void createTables(DbConnection& database)
{
    database.execDML("DROP TABLE IF EXISTS restores; DROP TABLE IF EXISTS restore_files;"
                     "CREATE TABLE restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT, "
                     "encryption_key TEXT);"
                     "CREATE TABLE restore_files(restore_id INTEGER, manifest_path TEXT, file_size INTEGER, "
                     "timestamp INTEGER, ctime INTEGER, attributes INTEGER, target_path TEXT, overwrite INTEGER)");
}

// The inserts that any writer of these rows needs, through the same checked calls, with nothing to choose.
void bareInserts(const Manifest& manifest, DbConnection& database)
{
    const std::string path = "C:\\" + std::string(kPathLength - 3, 'p');
    database.beginTransaction(0);
    DbStatement insert =
        database.compileStatement("INSERT INTO restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                                  "attributes, target_path, overwrite) VALUES(?,?,?,?,?,?,?,?)");
    insert.bind(1, std::int64_t{1});
    for (std::uint32_t file = 0; file < manifest.fileCount(); ++file) {
        insert.bindUtf8(2, path);
        insert.bind(3, std::int64_t{123456789});
        insert.bind(4, std::int32_t{1700000000});
        insert.bind(5, std::int32_t{1600000000});
        insert.bind(6, std::int32_t{32});
        insert.bindUtf8(7, path);
        insert.bind(8, std::int32_t{1});
        insert.execDML();
    }
    database.commitTransaction();
}

// Bytes over the loaded manifest at the peak of planning.
std::vector<double> measurePlanning(const std::vector<std::string>& arguments)
{
    // The peak must be the plan's, not the load's: a block taken and given back raises it first where it stands.
    const ManifestRef manifest = loadSet(arguments[0], static_cast<std::uint32_t>(std::stoul(arguments[1])));
    const RestoreRequest request = everything(*manifest);
    const double before = workingSet();
    const RestorePlan plan = planRestore(request, *manifest, [](const std::string&) { return false; });
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row)
        plan.readEntry(row, entry);
    return {workingSet() - before, static_cast<double>(plan.size())};
}
const Child planningChild("restore-memory", measurePlanning);

void restoreBench(Bench& bench)
{
    const std::uint32_t files = bench.quick() ? 100000 : 1000000;
    const StoredText text = storedText(bench.dataFolder(), files, FileOrder::kWalk);
    const std::string at = ", " + std::to_string(files) + " rows";
    {
        const ManifestRef manifest = loadSet(text.file, files);
        const BenchInstall install(bench.dataFolder() + "/restore");
        DbConnection database = install.stateDatabase();
        const auto times = medianSeconds(bench.quick() ? 3 : 5, {
                                                                    [&] { createTables(database); },
                                                                    [&] { bareInserts(*manifest, database); },
                                                                    [&] { createTables(database); },
                                                                    [&] {
                                                                        RestoreRequest request = everything(*manifest);
                                                                        performRestore(request, *manifest);
                                                                    },
                                                                });
        DbQuery rows = database.execQuery("SELECT count(*) FROM restore_files");
        if (!rows.nextRow() || rows.fieldInt(0, 0) != static_cast<int>(files))
            throw std::runtime_error("the request lacks rows");
        bench.report({"planning and writing / bare inserts" + at, times[3] / times[1], 1.2, "x"});
        bench.report({"planning and writing" + at, times[3] * 1e3, kNoBound, "ms"});
    }
    const auto memory = bench.inOwnProcess("restore-memory", {text.file, std::to_string(files)});
    bench.report({"memory of planning, less 8 MB, a row" + at, (memory[0] - 8e6) / memory[1], 24, "bytes"});
    bench.report({"memory of planning a row" + at, memory[0] / memory[1], kNoBound, "bytes"});
}
const Group restoreGroup("restore", restoreBench);

} // namespace
} // namespace tavi::bench
