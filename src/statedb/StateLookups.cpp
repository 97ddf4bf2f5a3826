#include "statedb/StateLookups.h"

#include <mutex>

#include <wx/log.h>

#include "core/CriticalSection.h"
#include "core/InstallPaths.h"

namespace tavi {
namespace {

const char* const kFolderSelect = "SELECT state FROM filesystem WHERE folder=?";
const char* const kFolderReplace = "INSERT OR REPLACE INTO filesystem(state,folder) VALUES(?,?)";
const char* const kFolderDelete = "DELETE FROM filesystem WHERE folder=?";
const char* const kFileSelect = "SELECT state FROM file_states WHERE filename=?";

CriticalSection& fileStateLock()
{
    static CriticalSection lock;
    return lock;
}

} // namespace

FolderStateTable::FolderStateTable()
{
    connection_.open(getConfigFilePath(kConfigDatabase));
    select_ = connection_.compileStatement(kFolderSelect);
    // Prepared and never run: a table without these columns is refused at once.
    replace_ = connection_.compileStatement(kFolderReplace);
    delete_ = connection_.compileStatement(kFolderDelete);
}

FolderStateTable::~FolderStateTable()
{
    try {
        select_.finalize();
        replace_.finalize();
    } catch (...) {
        // Their last run failed, which its caller has been told. What is not finalized yet goes with the members.
    }
    // The delete statement goes after the connection, with the members.
    connection_.close();
}

FolderStateTable::ReadScope::ReadScope(FolderStateTable& table) : table_(table)
{
    table_.connection_.beginTransaction(0);
    table_.knownParent_.clear();
    table_.reading_ = true;
}

FolderStateTable::ReadScope::~ReadScope()
{
    table_.reading_ = false;
    table_.knownParent_.clear();
    try {
        table_.connection_.commitTransaction();
    } catch (...) {
        // Nothing was written. Either SQLite has ended the transaction by itself, or the lock lasts until the table is
        // destroyed.
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
    // A statement left on its row would keep the service from writing for as long as the object lives.
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
    if (reading_ && !parent.empty() && parent == knownParent_)
        return passedOn_;
    FolderState passedOn = FolderState::allOff;
    for (wxString folder = parent; !folder.empty(); folder = folder.BeforeLast(L'\\')) {
        if (const auto state = recordedState(folder)) {
            passedOn = inherited(*state);
            break;
        }
    }
    knownParent_ = parent;
    passedOn_ = passedOn;
    return passedOn;
}

std::int32_t FileStateLookup::getFileState(const wxString& path)
{
    std::int32_t state = kUnknown;
    if (!connection_) {
        try {
            auto connection = std::make_unique<DbConnection>();
            connection->open(getDataFilePath(kStateDatabase));
            connection_ = std::move(connection);
        } catch (const DbException& error) {
            wxLogError("Failed to open file-state db (%d: %s)", error.code(), error.message());
            return state;
        }
    }
    const std::lock_guard<CriticalSection> hold(fileStateLock());
    try {
        DbStatement select = connection_->compileStatement(kFileSelect);
        select.bind(1, path);
        DbQuery rows = select.execQuery();
        if (rows.nextRow())
            state = rows.fieldInt(0, 0);
    } catch (const DbException& error) {
        wxLogError("Failed to retrieve file state (%d: %s)", error.code(), error.message());
    }
    return state;
}

} // namespace tavi
