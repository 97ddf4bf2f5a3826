#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include <wx/string.h>

#include "core/FolderState.h"
#include "statedb/Database.h"

namespace tavi {

// The service's states of folders. Each shell object has one, which belongs to its thread and stays connected.
class FolderStateTable {
  public:
    // Throws DbException when the configuration database cannot be used.
    FolderStateTable();
    FolderStateTable(const FolderStateTable&) = delete;
    FolderStateTable& operator=(const FolderStateTable&) = delete;
    ~FolderStateTable();

    // Returns the state recorded for the path, or what it inherits from the nearest recorded ancestor; allOff if there
    // is none. Letter case counts. Throws DbException.
    FolderState getFolderState(const wxString& path);

    // Locks the database for reading, once for many lookups: the lock is most of what a lookup costs. The constructor
    // throws DbException.
    class ReadScope {
      public:
        explicit ReadScope(FolderStateTable& table);
        ReadScope(const ReadScope&) = delete;
        ReadScope& operator=(const ReadScope&) = delete;
        ~ReadScope();

      private:
        FolderStateTable& table_;
    };

  private:
    std::optional<FolderState> recordedState(const wxString& folder);

    // Within a ReadScope: the folder of the last path and the state that its entries inherit.
    bool isReading_ = false;
    wxString knownParent_;
    FolderState inherited_ = FolderState::off;
    DbConnection connection_;
    DbStatement select_;
    DbStatement replace_;
    DbStatement delete_;
};

// Looks up the service's state of a file. Created for each lookup; any thread.
class FileStateLookup {
  public:
    static constexpr std::int32_t kUnknown = 15;

    // Returns kUnknown if no state is recorded or the database fails; a failure is logged.
    std::int32_t getFileState(const wxString& path);

  private:
    std::unique_ptr<DbConnection> connection_;
};

} // namespace tavi
