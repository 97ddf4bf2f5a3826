#include "manifest/ManifestWatcher.h"

#include <utility>

#include <wx/log.h>

#include "manifest/StoredManifest.h"
#include "core/Boundary.h"
#include "core/InstallPaths.h"
#include "statedb/Database.h"

namespace tavi {
namespace {

constexpr std::uint32_t kNapMilliseconds = 500;
constexpr int kNapsPerCycle = 10;
constexpr std::uint32_t kCyclesPerExclusionBuild = 18;

// A null result, from an invalid text, leaves the manifest in force where it is: its readers lose nothing by a text
// that the service is about to replace.
void publish(WatcherState& state, ManifestRef manifest)
{
    if (manifest)
        state.manifest.replace(std::move(manifest));
}

} // namespace

ManifestRef readStoredManifest()
{
    try {
        DbConnection database;
        database.open(getDataFilePath(kStateDatabase));
        DbQuery rows = database.execQuery("SELECT contents FROM manifest LIMIT 1");
        if (rows.nextRow()) {
            const char* blob = nullptr;
            const int length = rows.fieldText(0, blob);
            if (length > 0)
                return parseStoredManifest(blob, static_cast<std::size_t>(length));
        }
    } catch (const DbException& error) {
        wxLogWarning("Failed to retrieve stored manifest (%d: %s)", error.code(), error.message());
    }
    return Manifest::parse(wxString());
}

void runManifestWatcher(WatcherState& state, WatcherServices& services)
{
    const auto load = [&] {
        guarded("manifest load", [&] { publish(state, services.loadManifest()); });
        state.lastLoad = services.now();
    };
    const auto loadIfChanged = [&] {
        guarded("manifest check", [&] {
            std::int64_t changed = 0;
            if (services.manifestTime(changed) && changed > state.lastLoad)
                load();
        });
    };

    guarded("exclusion build", [&] { services.buildExclusions(true); });
    // A watcher that starts again while the host keeps the module finds the manifest of the one before it.
    if (state.manifest.acquire())
        loadIfChanged();
    else
        load();
    for (std::uint32_t cycles = 0; !services.isStopping();) {
        for (int naps = 0; naps < kNapsPerCycle; ++naps) {
            if (services.isStopping())
                return;
            services.sleep(kNapMilliseconds);
        }
        if (services.isStopping())
            return;
        loadIfChanged();
        if (++cycles % kCyclesPerExclusionBuild == 0)
            guarded("exclusion build", [&] { services.buildExclusions(false); });
    }
}

} // namespace tavi
