#pragma once

#include <cstdint>
#include <exception>
#include <memory>
#include <string>

#include <wx/string.h>

struct sqlite3;
struct sqlite3_stmt;

// The only way to the service's two databases. None of these objects locks: each is used on the thread that made it.
// Every failure is a DbException; destructors never throw.
namespace tavi {

constexpr int kOwnDbError = 1000;

// A result code of the library, or kOwnDbError, with a text of the form NAME[code]: detail.
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

// Gives back what the database library holds for the process. Only when no connection is open and none will be opened.
void shutDownDatabaseLibrary() noexcept;

// A statement handle that a statement and its cursors share: whoever finalizes it, the others find it empty.
using StatementSlot = std::shared_ptr<sqlite3_stmt*>;

// A cursor over the rows of one run. The first step is taken when it is made, so that an empty result is known at once.
class DbQuery {
  public:
    DbQuery() noexcept = default;
    DbQuery(DbQuery&& other) noexcept = default;
    DbQuery& operator=(DbQuery&& other) noexcept;
    ~DbQuery();

    // True when the cursor stands on a row; call it before the first one too.
    bool nextRow();
    // Points `text` to the column as UTF-8, or to a blob's bytes, valid until the next step; null for NULL. Returns the
    // length in bytes.
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

// A prepared statement that is run again and again. Runs keep the bindings.
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
    // For texts that are in UTF-8 already; ends at the first zero, as the others do.
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

class DbConnection {
  public:
    DbConnection() noexcept = default;
    DbConnection(DbConnection&& other) noexcept;
    DbConnection& operator=(DbConnection&& other) noexcept;
    ~DbConnection();

    // Creates the file when it is missing.
    void open(const wxString& path);
    void close() noexcept;
    int execDML(const char* sql);
    int execDML(const wxString& sql);
    DbStatement compileStatement(const char* sql);
    DbQuery execQuery(const char* sql);
    std::int64_t lastRowId() const;
    // 1 begins a deferred transaction, 2 and 3 an immediate one, every other mode a plain one.
    void beginTransaction(int mode);
    void commitTransaction();
    void rollbackTransaction();

  private:
    void check() const;
    StatementSlot prepare(const char* sql) const;

    sqlite3* connection_ = nullptr;
    int busyTimeout_ = 60000;
};

} // namespace tavi
