#pragma once

#include <memory>
#include <optional>

#include "restore/RestorePlanner.h"
#include "statedb/Database.h"

namespace tavi {

// Stores a request in the service's state database, whole or not at all. Belongs to one thread; failures are logged.
class RestoreRequestWriter {
  public:
    // Opens the database and begins a transaction. On failure requestRestore writes nothing.
    void open();
    // Returns true if the rows were committed and the next transaction has begun. A failure that cannot be rolled back
    // closes the connection.
    bool requestRestore(const RestorePlan& files, const wxString& machineId, const wxString& machineAlias,
                        const wxString& encryptionKey);
    void close();

  private:
    void restartTransaction() noexcept;
    void disconnect() noexcept;

    std::unique_ptr<DbConnection> connection_;
    std::optional<Transaction> transaction_;
};

// Plans the request, stores it in the state database and empties its path set. Failures of the database are logged.
void performRestore(RestoreRequest& request, const Manifest& manifest);

} // namespace tavi
