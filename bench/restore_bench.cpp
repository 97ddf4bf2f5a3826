#include <stdexcept>

#include "bench/Bench.h"
#include "bench/InstalledService.h"
#include "bench/ManifestGenerator.h"
#include "restore/RestoreRequest.h"

namespace tavi::bench {
namespace {

RestoreRequest wholeSet(const Manifest& manifest)
{
    return {{manifest.filePath(0).Left(3)}, 0xFFFFFFFE, L"", L"", true, L"", L"", L""};
}

// The least work of any writer of these rows: the same checked inserts, with nothing to choose.
void bareInserts(DbConnection& database, std::uint32_t rows)
{
    const std::string path = "C:\\" + std::string(kPathLength - 3, 'p');
    database.execDML("begin transaction");
    DbStatement insert =
        database.compileStatement("INSERT INTO restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                                  "attributes, target_path, overwrite) VALUES(?,?,?,?,?,?,?,?)");
    insert.bind(1, std::int64_t{1});
    for (; rows > 0; --rows) {
        insert.bindUtf8(2, path);
        insert.bind(3, std::int64_t{123456789});
        insert.bind(4, std::int32_t{1700000000});
        insert.bind(5, std::int32_t{1600000000});
        insert.bind(6, std::int32_t{32});
        insert.bindUtf8(7, path);
        insert.bind(8, std::int32_t{1});
        insert.execDML();
    }
    database.execDML("commit transaction");
}

} // namespace

// Returns the bytes that a plan adds to the loaded manifest, and the number of its rows.
std::vector<double> measurePlanning(const Arguments& arguments)
{
    const ManifestRef manifest = loadSet(arguments[0], static_cast<std::uint32_t>(std::stoul(arguments[1])));
    const RestoreRequest request = wholeSet(*manifest);
    const double before = workingSet().now;
    const RestorePlan plan = planRestore(request, *manifest, [](const std::string&) { return false; });
    RestoreFileEntry entry;
    for (std::uint32_t row = 0; row < plan.size(); ++row)
        plan.readEntry(row, entry);
    return {workingSet().now - before, static_cast<double>(plan.size())};
}

void runRestore(Bench& bench)
{
    const StoredText text = storedText(bench.dataFolder, bench.files, FileOrder::walk);
    const std::string at = ", " + std::to_string(bench.files) + " rows";
    const ManifestRef manifest = loadSet(text.file, bench.files);
    const test::InstalledService service;
    service.createTables();
    DbConnection database = service.database(L"tavistate.dat");
    const auto clear = [&] { database.execDML("DELETE FROM restores; DELETE FROM restore_files"); };
    const auto insert = [&] {
        clear();
        bareInserts(database, bench.files);
    };
    const auto request = [&] {
        clear();
        RestoreRequest all = wholeSet(*manifest);
        performRestore(all, *manifest);
    };
    // Each file exists, so that each row has a name of its own.
    RestoreRequest keeping = wholeSet(*manifest);
    keeping.overwrite = false;
    const auto plan = [&] {
        planRestore(keeping, *manifest, [](const std::string& path) { return path.find('(') == std::string::npos; });
    };
    const auto times = leastProcessorSeconds(bench.quick ? 3 : 5, {insert, request, plan});
    DbQuery rows = database.execQuery("SELECT count(*) FROM restore_files");
    if (!rows.nextRow() || rows.fieldInt(0, 0) != static_cast<int>(bench.files))
        throw std::runtime_error("the request lacks rows");
    bench.report("planning and writing / bare inserts" + at, times[1] / times[0], 1.2, "x");
    bench.report("planning of free names / bare inserts" + at, times[2] / times[0], 0.8, "x");
    bench.report("planning and writing" + at, times[1] * 1e3, kNoBound, "ms");
    const auto memory = bench.inOwnProcess("planning", {text.file, std::to_string(bench.files)});
    bench.report("memory of planning, less 8 MB, a row" + at, (memory[0] - 8e6) / memory[1], 24, "bytes");
}

} // namespace tavi::bench
