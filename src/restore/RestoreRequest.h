#pragma once

#include <memory>

#include "statedb/Database.h"
#include "restore/RestorePlanner.h"

namespace tavi {

// Stores one request in the service's state database: all of it or nothing. Used by one thread; every failure is
// logged.
class RestoreRequestWriter {
  public:
    // Opens the database and begins a transaction. On failure requestRestore writes nothing.
    void open();
    // True when the rows have been written and the next transaction begun. A failure that cannot be rolled back closes
    // the connection.
    bool requestRestore(const RestorePlan& files, const wxString& machineId, const wxString& machineAlias,
                        const wxString& encryptionKey);
    void close();

  private:
    void recover() noexcept;

    std::unique_ptr<DbConnection> connection_;
};

// Plans the request, writes it into the state database and empties its path set. What fails in the database is logged.
void performRestore(RestoreRequest& request, const Manifest& manifest);

} // namespace tavi
