#include "statedb/StateLookups.h"

#include <mutex>

#include "core/CriticalSection.h"
#include "core/InstallPaths.h"
#include "core/LogLine.h"

namespace tavi {
namespace {

const char* const kFolderSelect = "SELECT state FROM filesystem WHERE folder=?";
const char* const kFolderReplace = "INSERT OR REPLACE INTO filesystem(state,folder) VALUES(?,?)";
const char* const kFolderDelete = "DELETE FROM filesystem WHERE folder=?";
const char* const kFileSelect = "SELECT state FROM file_states WHERE filename=?";

CriticalSection fileStateLock;

} // namespace

FolderStateTable::FolderStateTable()
{
    connection_.open(getConfigFilePath(ConfigFile::database));
    select_ = connection_.compileStatement(kFolderSelect);
    // Prepared but never run: this fails at once for a table without these columns.
    replace_ = connection_.compileStatement(kFolderReplace);
    delete_ = connection_.compileStatement(kFolderDelete);
}

// The statement that has run is finalized first, so that its locks end with the connection. delete_, which never runs,
// is finalized by its own destructor after the close; DbConnection::close allows that.
FolderStateTable::~FolderStateTable()
{
    try {
        select_.finalize();
        replace_.finalize();
    } catch (...) {
        // Finalizing reports a failure of the last run, which was thrown then.
    }
    connection_.close();
}

FolderStateTable::ReadScope::ReadScope(FolderStateTable& table) : table_(table)
{
    table_.connection_.beginTransaction();
    table_.knownParent_.clear();
    table_.isReading_ = true;
}

FolderStateTable::ReadScope::~ReadScope()
{
    table_.isReading_ = false;
    table_.knownParent_.clear();
    try {
        // Nothing was written: this only unlocks. A narrow text needs no conversion, so it also unlocks when no memory
        // is left.
        table_.connection_.execDML("rollback transaction");
    } catch (...) {
        // SQLite has ended the transaction after a failure.
    }
}

std::optional<FolderState> FolderStateTable::recordedState(const wxString& folder)
{
    select_.reset();
    select_.bind(1, folder);
    DbQuery rows = select_.execQuery();
    if (!rows.nextRow())
        return std::nullopt;
    const auto state = static_cast<FolderState>(rows.fieldInt(0, 0));
    // A statement that is not reset holds a lock that keeps the service from writing.
    select_.reset();
    return state;
}

FolderState FolderStateTable::getFolderState(const wxString& path)
{
    if (path.empty())
        return FolderState::allOff;
    if (const auto state = recordedState(path))
        return *state;
    const wxString parent = path.BeforeLast(L'\\');
    if (isReading_ && !parent.empty() && parent == knownParent_)
        return inherited_;
    FolderState result = FolderState::allOff;
    for (wxString folder = parent; !folder.empty(); folder = folder.BeforeLast(L'\\')) {
        if (const auto state = recordedState(folder)) {
            result = inherited(*state);
            break;
        }
    }
    knownParent_ = parent;
    inherited_ = result;
    return result;
}

std::int32_t FileStateLookup::getFileState(const wxString& path)
{
    std::int32_t state = kUnknown;
    if (!connection_) {
        try {
            auto connection = std::make_unique<DbConnection>();
            connection->open(getDataFilePath(DataFile::stateDatabase));
            connection_ = std::move(connection);
        } catch (const DbException& error) {
            logError(L"Failed to open file-state db (%d: %ls)", error.code(), error.message().wc_str());
            return state;
        }
    }
    const std::lock_guard<CriticalSection> hold(fileStateLock);
    try {
        DbStatement select = connection_->compileStatement(kFileSelect);
        select.bind(1, path);
        DbQuery rows = select.execQuery();
        if (rows.nextRow())
            state = rows.fieldInt(0, 0);
    } catch (const DbException& error) {
        logError(L"Failed to retrieve file state (%d: %ls)", error.code(), error.message().wc_str());
    }
    return state;
}

} // namespace tavi
