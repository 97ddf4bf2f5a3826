#include "restore/RestoreRequest.h"

#include <ctime>
#include <string>
#include <string_view>

#include <windows.h>
#include <wx/log.h>

#include "core/InstallPaths.h"
#include "core/Utf8.h"

namespace tavi {
namespace {

const char* const kInsertRestore =
    "INSERT INTO restores(request_time, machine_id, machine_alias, encryption_key) VALUES (?,?,?,?)";
const char* const kInsertFile = "INSERT INTO restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                                "attributes, target_path, overwrite) VALUES(?,?,?,?,?,?,?,?)";
constexpr int kPlainTransaction = 0;

// Tells whether something stands at a path. Files come folder by folder, and a missing file in a large folder may take
// the system a millisecond to miss: each parent folder is looked up once, and nothing stands below a missing one.
class TargetProbe {
  public:
    bool operator()(const std::string& path)
    {
        // With its separator, without which the root of a drive is no folder.
        const std::string_view parent = std::string_view(path).substr(0, path.rfind('\\') + 1);
        if (parent.empty())
            return lookUp(path) == ERROR_SUCCESS;
        if (parent != parent_) {
            parent_ = parent;
            // A folder that may not be looked at may still hold files that can be.
            const DWORD answer = lookUp(parent_);
            parentMayHold_ = answer == ERROR_SUCCESS || answer == ERROR_ACCESS_DENIED;
        }
        return parentMayHold_ && lookUp(path) == ERROR_SUCCESS;
    }

  private:
    static DWORD lookUp(const std::string& path)
    {
        const wxString wide = fromUtf8(path);
        return GetFileAttributesW(wide.wc_str()) == INVALID_FILE_ATTRIBUTES ? GetLastError() : ERROR_SUCCESS;
    }

    std::string parent_;
    bool parentMayHold_ = false;
};

} // namespace

void RestoreRequestWriter::open()
{
    try {
        connection_ = std::make_unique<DbConnection>();
        connection_->open(getDataFilePath(kStateDatabase));
        connection_->beginTransaction(kPlainTransaction);
    } catch (const DbException& error) {
        wxLogError("Failed to open state db for restores: %s", error.message());
        connection_.reset();
    }
}

bool RestoreRequestWriter::requestRestore(const RestorePlan& files, const wxString& machineId,
                                          const wxString& machineAlias, const wxString& encryptionKey)
{
    if (!connection_)
        return false;
    try {
        DbStatement insertRestore = connection_->compileStatement(kInsertRestore);
        DbStatement insertFile = connection_->compileStatement(kInsertFile);
        insertRestore.bind(1, static_cast<std::int32_t>(std::time(nullptr)));
        insertRestore.bind(2, machineId);
        insertRestore.bind(3, machineAlias);
        insertRestore.bind(4, encryptionKey);
        insertRestore.execDML();
        insertFile.bind(1, connection_->lastRowId());
        RestoreFileEntry entry;
        for (std::uint32_t row = 0; row < files.size(); ++row) {
            files.readEntry(row, entry);
            insertFile.bindUtf8(2, entry.manifestPath);
            insertFile.bind(3, entry.fileSize);
            insertFile.bind(4, static_cast<std::int32_t>(entry.timestamp));
            insertFile.bind(5, static_cast<std::int32_t>(entry.ctime));
            insertFile.bind(6, static_cast<std::int32_t>(entry.attributes));
            insertFile.bindUtf8(7, entry.targetPath);
            insertFile.bind(8, std::int32_t{entry.overwrite});
            insertFile.execDML();
        }
        connection_->commitTransaction();
        insertRestore.finalize();
        insertFile.finalize();
        connection_->beginTransaction(kPlainTransaction);
        return true;
    } catch (const DbException& error) {
        wxLogError("Error requesting restore: %s", error.message());
        recover();
        return false;
    }
}

void RestoreRequestWriter::recover() noexcept
{
    try {
        connection_->rollbackTransaction();
        connection_->beginTransaction(kPlainTransaction);
    } catch (...) {
        // The rows may still be in an open transaction, which the commit in close() would store. Closing the connection
        // rolls it back. SQLite may also have rolled back by itself; then close() has nothing to commit.
        connection_.reset();
    }
}

void RestoreRequestWriter::close()
{
    if (!connection_)
        return;
    try {
        connection_->commitTransaction();
    } catch (const DbException& error) {
        wxLogError("Error committing restore information: %s", error.message());
    }
    connection_.reset();
}

void performRestore(RestoreRequest& request, const Manifest& manifest)
{
    TargetProbe probe;
    const RestorePlan plan = planRestore(request, manifest, [&](const std::string& path) { return probe(path); });
    RestoreRequestWriter writer;
    writer.open();
    writer.requestRestore(plan, request.machineId, request.machineAlias, request.encryptionKey);
    writer.close();
    request.selectedPaths.clear();
}

} // namespace tavi
