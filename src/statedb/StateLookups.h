#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include <wx/string.h>

#include "core/FolderState.h"
#include "statedb/Database.h"

namespace tavi {

// The service's states of folders. One per shell object, used by its thread only; keeps its connection open.
class FolderStateTable {
  public:
    // Throws DbException when the configuration database cannot be used.
    FolderStateTable();
    FolderStateTable(const FolderStateTable&) = delete;
    FolderStateTable& operator=(const FolderStateTable&) = delete;
    ~FolderStateTable();

    // The state recorded for the path, or what the nearest recorded ancestor passes on; allOff where none is recorded.
    // Exact comparison, letter case included. Throws DbException.
    FolderState getFolderState(const wxString& path);

    // Holds the database for reading, so that many lookups in a row lock it once: the locks are most of what a lookup
    // costs. Throws DbException when it cannot.
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

    // While a ReadScope lives: the folder of the last path and what it passes on.
    bool reading_ = false;
    wxString knownParent_;
    FolderState passedOn_ = FolderState::off;
    DbConnection connection_;
    DbStatement select_;
    DbStatement replace_;
    DbStatement delete_;
};

// The service's state of one file; made for one question and destroyed after it. Any thread.
class FileStateLookup {
  public:
    static constexpr std::int32_t kUnknown = 15;

    // kUnknown when nothing is recorded or the database fails, which is logged.
    std::int32_t getFileState(const wxString& path);

  private:
    std::unique_ptr<DbConnection> connection_;
};

} // namespace tavi
