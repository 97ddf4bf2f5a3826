#include "manifest/ManifestWatcher.h"

#include <new>
#include <utility>

#include <sqlite3.h>

#include "core/Boundary.h"
#include "core/InstallPaths.h"
#include "core/LogLine.h"
#include "manifest/StoredManifest.h"
#include "statedb/Database.h"

namespace tavi {
namespace {

constexpr const char* kSelectManifest = "SELECT contents FROM manifest LIMIT 1";
// Short, so that a stop request takes effect soon.
constexpr std::uint32_t kSleepMs = 500;
constexpr int kSleepsPerPoll = 10;
constexpr std::uint32_t kPollsPerExclusionBuild = 18;

// Returns a copy: the service cannot commit while a statement reads the row, and parsing takes long.
BlobPieces readBlob()
{
    DbConnection database;
    database.open(getDataFilePath(DataFile::stateDatabase));
    DbQuery rows = database.execQuery(kSelectManifest);
    const char* blob = nullptr;
    const int length = rows.nextRow() ? rows.fieldText(0, blob) : 0;
    return piecesOf({blob, static_cast<std::size_t>(length)});
}

} // namespace

ManifestRef readStoredManifest()
{
    try {
        return parseStoredManifest(readBlob());
    } catch (const DbException& error) {
        logWarning(L"Failed to retrieve stored manifest (%d: %ls)", error.code(), error.message().wc_str());
        if (error.code() == SQLITE_NOMEM)
            throw std::bad_alloc();
    }
    return Manifest::parse(wxString());
}

void runManifestWatcher(WatcherState& state, const WatcherServices& services)
{
    const auto load = [&] {
        state.isLoadDue = true;
        guarded("manifest load", [&] {
            // An invalid text leaves the former manifest in force until the service stores another.
            if (ManifestRef manifest = services.loadManifest())
                state.manifest.replace(std::move(manifest));
            state.isLoadDue = false;
        });
        state.lastLoad = services.now();
    };
    const auto loadIfChanged = [&] {
        guarded("manifest check", [&] {
            const auto changed = services.manifestTime();
            if (changed && *changed > state.lastLoad)
                load();
        });
    };

    guarded("exclusion build", [&] { services.buildExclusions(true); });
    // The host may keep the module after a stop request. The watcher that is then started finds the manifest of the
    // former one.
    if (state.isLoadDue || !state.manifest.acquire())
        load();
    else
        loadIfChanged();
    for (std::uint32_t polls = 0;;) {
        for (int sleeps = 0; sleeps < kSleepsPerPoll; ++sleeps) {
            if (services.isStopping())
                return;
            services.sleep(kSleepMs);
        }
        if (services.isStopping())
            return;
        loadIfChanged();
        if (++polls % kPollsPerExclusionBuild == 0) {
            guarded("exclusion build", [&] { services.buildExclusions(false); });
            // Not in every poll: a load that fails for lack of memory takes processor time, too.
            if (state.isLoadDue)
                load();
        }
    }
}

} // namespace tavi
