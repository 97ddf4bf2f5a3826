#pragma once

#include <cstdint>
#include <exception>
#include <memory>
#include <string>

#include <wx/string.h>

struct sqlite3;
struct sqlite3_stmt;

// The module's access to the service's two databases. None of these objects locks: each belongs to the thread that
// created it. Every failure is a DbException; destructors never throw.
namespace tavi {

constexpr int kOwnDbError = 1000;

// A result code of SQLite, or kOwnDbError, with a text of the form NAME[code]: detail.
class DbException : public std::exception {
  public:
    DbException(int code, const wxString& detail);

    int code() const noexcept
    {
        return code_;
    }
    const wxString& message() const noexcept
    {
        return message_;
    }
    // The message in UTF-8.
    const char* what() const noexcept override
    {
        return utf8_.c_str();
    }

  private:
    int code_;
    wxString message_;
    std::string utf8_;
};

// Releases what SQLite holds for the process. No connection may be open, and none may be opened later.
void shutDownDatabaseLibrary() noexcept;

// The handle that a statement and its cursors share. Once one of them has finalized it, it is null for all.
using StatementSlot = std::shared_ptr<sqlite3_stmt*>;

// A cursor over the rows of one run of a statement. The first row has been read when the cursor is created.
class DbQuery {
  public:
    DbQuery() noexcept = default;
    DbQuery(DbQuery&& other) noexcept = default;
    DbQuery& operator=(DbQuery&& other) noexcept;
    ~DbQuery();

    // Moves to the next row, the first one included. Returns false after the last.
    bool nextRow();
    // Stores a pointer to the column's UTF-8 text or blob, valid until the next row; null for NULL. Returns the length
    // in bytes.
    int fieldText(int index, const char*& text);
    int fieldType(int index);
    int fieldInt(int index, int valueIfNull);
    void finalize();

  private:
    friend class DbConnection;
    friend class DbStatement;
    DbQuery(sqlite3* connection, StatementSlot statement, bool atEnd, bool ownsStatement) noexcept;
    sqlite3_stmt* statement() const;
    sqlite3_stmt* statementWith(int index) const;

    sqlite3* connection_ = nullptr;
    StatementSlot statement_;
    bool atEnd_ = true;
    bool firstRowPending_ = false;
    int columnCount_ = 0;
    bool ownsStatement_ = false;
};

// A prepared statement, for any number of runs. Runs keep the bindings.
class DbStatement {
  public:
    DbStatement() noexcept = default;
    DbStatement(DbStatement&& other) noexcept = default;
    DbStatement& operator=(DbStatement&& other) noexcept;
    ~DbStatement();

    // Parameters count from 1.
    void bind(int index, const wxString& value);
    void bind(int index, std::int32_t value);
    void bind(int index, std::int64_t value);
    // Binds a text that is in UTF-8 already. This text too ends at its first zero.
    void bindUtf8(int index, const std::string& value);
    // Returns the number of changed rows.
    int execDML();
    DbQuery execQuery();
    void reset();
    void finalize();

  private:
    friend class DbConnection;
    DbStatement(sqlite3* connection, StatementSlot statement) noexcept;
    sqlite3_stmt* statement() const;

    sqlite3* connection_ = nullptr;
    StatementSlot statement_;
};

// How a transaction locks the database: plain and deferred ones when they first read or write, the others at once for
// writing. Exclusive is immediate: an exclusive lock would keep the service from reading. The module uses plain ones.
enum class TransactionMode { plain, deferred, immediate, exclusive };

class DbConnection {
  public:
    DbConnection() noexcept = default;
    DbConnection(DbConnection&& other) noexcept;
    DbConnection& operator=(DbConnection&& other) noexcept;
    ~DbConnection();

    // Creates the file if it is missing.
    void open(const wxString& path);
    void close() noexcept;
    int execDML(const char* sql);
    int execDML(const wxString& sql);
    DbStatement compileStatement(const char* sql);
    DbQuery execQuery(const char* sql);
    std::int64_t lastRowId() const;
    void beginTransaction(TransactionMode mode = TransactionMode::plain);
    void commitTransaction();
    void rollbackTransaction();

  private:
    void check() const;
    StatementSlot prepare(const char* sql) const;

    sqlite3* connection_ = nullptr;
    int busyTimeoutMs_ = 60000;
};

// A transaction of a connection, which must outlive it. The destructor rolls back what was neither committed nor rolled
// back.
class Transaction {
  public:
    explicit Transaction(DbConnection& connection, TransactionMode mode = TransactionMode::plain);
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    ~Transaction();

    // After a failure the transaction may still be open.
    void commit();
    // Returns false if SQLite refuses: the transaction then ends with the connection, if SQLite has not ended it.
    bool rollback() noexcept;

  private:
    DbConnection& connection_;
    bool isOpen_ = true;
};

} // namespace tavi
