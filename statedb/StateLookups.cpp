#include "statedb/StateLookups.h"

#include <mutex>

#include <windows.h>
#include <wx/log.h>

#include "core/InstallPaths.h"

namespace tavi {
namespace {

constexpr std::int32_t kInheritedIn = 7;
constexpr std::int32_t kInheritedOut = 8;

const char* const kFolderSelect = "SELECT state FROM filesystem WHERE folder=?";
const char* const kFolderReplace = "INSERT OR REPLACE INTO filesystem(state,folder) VALUES(?,?)";
const char* const kFolderDelete = "DELETE FROM filesystem WHERE folder=?";
const char* const kFileSelect = "SELECT state FROM file_states WHERE filename=?";

// What a folder takes over from the nearest recorded one above it.
std::int32_t inherited(std::int32_t state)
{
    switch (state) {
    case 0:
    case 2:
        return kInheritedOut;
    case 1:
    case 3:
    case 5:
        return kInheritedIn;
    default:
        return state;
    }
}

// Not the library's mutex: what that one makes stays behind when the module is unloaded.
class CriticalSection {
  public:
    CriticalSection() noexcept
    {
        InitializeCriticalSection(&section_);
    }
    CriticalSection(const CriticalSection&) = delete;
    CriticalSection& operator=(const CriticalSection&) = delete;
    ~CriticalSection()
    {
        DeleteCriticalSection(&section_);
    }
    void lock() noexcept
    {
        EnterCriticalSection(&section_);
    }
    void unlock() noexcept
    {
        LeaveCriticalSection(&section_);
    }

  private:
    CRITICAL_SECTION section_;
};

CriticalSection& fileStateLock()
{
    static CriticalSection lock;
    return lock;
}

} // namespace

FolderStateTable::FolderStateTable()
{
    connection_.open(GetConfigFilePath(kConfigDatabase));
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
    } catch (const DbException&) {
        // Their last run failed, which its caller has been told.
    }
    // The delete statement goes after the connection, with the members.
    connection_.close();
}

std::int32_t FolderStateTable::getFolderState(const wxString& path)
{
    bool isPathItself = true;
    for (wxString folder = path; !folder.empty(); folder = folder.BeforeLast(L'\\')) {
        select_.reset();
        select_.bind(1, folder);
        DbQuery rows = select_.execQuery();
        if (rows.nextRow()) {
            const std::int32_t state = rows.fieldInt(0, 0);
            // A statement left on its row would keep the service from writing for as long as the object lives.
            select_.reset();
            return isPathItself ? state : inherited(state);
        }
        isPathItself = false;
    }
    return kInheritedOut;
}

std::int32_t FileStateLookup::getFileState(const wxString& path)
{
    std::int32_t state = kUnknown;
    if (!connection_) {
        try {
            auto connection = std::make_unique<DbConnection>();
            connection->open(GetDataFilePath(kStateDatabase));
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
