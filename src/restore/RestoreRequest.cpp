#include "restore/RestoreRequest.h"

#include <ctime>
#include <string>
#include <string_view>

#include <windows.h>

#include "core/InstallPaths.h"
#include "core/LogLine.h"
#include "core/Utf8.h"

namespace tavi {
namespace {

const char* const kInsertRestore =
    "INSERT INTO restores(request_time, machine_id, machine_alias, encryption_key) VALUES (?,?,?,?)";
const char* const kInsertFile = "INSERT INTO restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                                "attributes, target_path, overwrite) VALUES(?,?,?,?,?,?,?,?)";

// Returns whether a path exists. In a large folder the system needs up to a millisecond for a file that is missing, so
// the parent, which files in a row share, is looked up first: nothing exists below a missing folder.
class TargetProbe {
  public:
    bool operator()(const std::string& path)
    {
        // With its separator: "C:" is not the root of the drive.
        const std::string_view parent = std::string_view(path).substr(0, path.rfind('\\') + 1);
        if (parent.empty())
            return lookUp(path) == ERROR_SUCCESS;
        if (parent != parent_) {
            parent_ = parent;
            // The files of a folder without access may be accessible.
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
    disconnect();
    try {
        connection_ = std::make_unique<DbConnection>();
        connection_->open(getDataFilePath(DataFile::stateDatabase));
        transaction_.emplace(*connection_);
    } catch (const DbException& error) {
        logError(L"Failed to open state db for restores: %ls", error.message().wc_str());
        disconnect();
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
        transaction_->commit();
        insertRestore.finalize();
        insertFile.finalize();
        transaction_.emplace(*connection_);
        return true;
    } catch (const DbException& error) {
        logError(L"Error requesting restore: %ls", error.message().wc_str());
        restartTransaction();
        return false;
    }
}

void RestoreRequestWriter::restartTransaction() noexcept
{
    try {
        if (transaction_ && transaction_->rollback()) {
            transaction_.emplace(*connection_);
            return;
        }
    } catch (...) {
        // As if the rollback had failed.
    }
    // The rows may still be in an open transaction, which close() would commit. Closing the connection rolls it back.
    disconnect();
}

void RestoreRequestWriter::close()
{
    if (!connection_)
        return;
    try {
        transaction_->commit();
    } catch (const DbException& error) {
        logError(L"Error committing restore information: %ls", error.message().wc_str());
    }
    disconnect();
}

void RestoreRequestWriter::disconnect() noexcept
{
    transaction_.reset();
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
