#include "statedb/Database.h"

#include <utility>

#include <sqlite3.h>

#include "core/Utf8.h"

namespace tavi {
namespace {

struct CodeName {
    int code;
    const wchar_t* name;
};
const CodeName kCodeNames[] = {
    {SQLITE_OK, L"DB_OK"},
    {SQLITE_ERROR, L"DB_ERROR"},
    {SQLITE_INTERNAL, L"DB_INTERNAL"},
    {SQLITE_PERM, L"DB_PERM"},
    {SQLITE_ABORT, L"DB_ABORT"},
    {SQLITE_BUSY, L"DB_BUSY"},
    {SQLITE_LOCKED, L"DB_LOCKED"},
    {SQLITE_NOMEM, L"DB_NOMEM"},
    {SQLITE_READONLY, L"DB_READONLY"},
    {SQLITE_INTERRUPT, L"DB_INTERRUPT"},
    {SQLITE_IOERR, L"DB_IOERR"},
    {SQLITE_CORRUPT, L"DB_CORRUPT"},
    {SQLITE_NOTFOUND, L"DB_NOTFOUND"},
    {SQLITE_FULL, L"DB_FULL"},
    {SQLITE_CANTOPEN, L"DB_CANTOPEN"},
    {SQLITE_PROTOCOL, L"DB_PROTOCOL"},
    {SQLITE_EMPTY, L"DB_EMPTY"},
    {SQLITE_SCHEMA, L"DB_SCHEMA"},
    {SQLITE_TOOBIG, L"DB_TOOBIG"},
    {SQLITE_CONSTRAINT, L"DB_CONSTRAINT"},
    {SQLITE_MISMATCH, L"DB_MISMATCH"},
    {SQLITE_MISUSE, L"DB_MISUSE"},
    {SQLITE_NOLFS, L"DB_NOLFS"},
    {SQLITE_AUTH, L"DB_AUTH"},
    {SQLITE_FORMAT, L"DB_FORMAT"},
    {SQLITE_RANGE, L"DB_RANGE"},
    {SQLITE_ROW, L"DB_ROW"},
    {SQLITE_DONE, L"DB_DONE"},
    {kOwnDbError, L"WDB_ERROR"},
};

// The wrapper's own messages.
constexpr const wchar_t* kNoDatabase = L"No Database opened";
constexpr const wchar_t* kNoStatement = L"Statement not accessible";
constexpr const wchar_t* kBadIndex = L"Invalid field index";
constexpr const wchar_t* kBadString = L"Error binding string param";
constexpr const wchar_t* kBadInt = L"Error binding int param";
constexpr const wchar_t* kBadInt64 = L"Error binding int64 param";

const wchar_t* nameOf(int code)
{
    for (const CodeName& row : kCodeNames) {
        if (row.code == code)
            return row.name;
    }
    return L"UNKNOWN_ERROR";
}

wxString errorText(sqlite3* connection)
{
    const char* const text = sqlite3_errmsg(connection);
    return text ? fromUtf8(text) : wxString();
}

void throwIf(int result, sqlite3* connection)
{
    if (result != SQLITE_OK)
        throw DbException(result, errorText(connection));
}

void throwIf(int result, const wchar_t* message)
{
    if (result != SQLITE_OK)
        throw DbException(result, message);
}

[[noreturn]] void throwOwn(const wchar_t* message)
{
    throw DbException(kOwnDbError, message);
}

int finalizeSlot(const StatementSlot& slot) noexcept
{
    return slot && *slot ? sqlite3_finalize(std::exchange(*slot, nullptr)) : SQLITE_OK;
}

bool isRowOrDone(int result)
{
    return result == SQLITE_ROW || result == SQLITE_DONE;
}

} // namespace

void shutDownDatabaseLibrary() noexcept
{
    sqlite3_shutdown();
}

DbException::DbException(int code, const wxString& detail)
    : code_(code), message_(nameOf(code) + (L'[' + std::to_wstring(code) + L"]: ") + detail),
      utf8_(toUtf8(view(message_)))
{
}

DbQuery::DbQuery(sqlite3* connection, StatementSlot statement, bool atEnd, bool ownsStatement) noexcept
    : connection_(connection), statement_(std::move(statement)), atEnd_(atEnd), firstRowPending_(true),
      columnCount_(sqlite3_column_count(*statement_)), ownsStatement_(ownsStatement)
{
}

DbQuery& DbQuery::operator=(DbQuery&& other) noexcept
{
    if (this != &other) {
        if (ownsStatement_)
            finalizeSlot(statement_);
        connection_ = other.connection_;
        statement_ = std::move(other.statement_);
        atEnd_ = other.atEnd_;
        firstRowPending_ = other.firstRowPending_;
        columnCount_ = other.columnCount_;
        ownsStatement_ = other.ownsStatement_;
    }
    return *this;
}

DbQuery::~DbQuery()
{
    if (ownsStatement_)
        finalizeSlot(statement_);
}

sqlite3_stmt* DbQuery::statement() const
{
    if (!statement_ || !*statement_)
        throwOwn(kNoStatement);
    return *statement_;
}

sqlite3_stmt* DbQuery::statementWith(int index) const
{
    sqlite3_stmt* const held = statement();
    if (index < 0 || index >= columnCount_)
        throwOwn(kBadIndex);
    return held;
}

bool DbQuery::nextRow()
{
    sqlite3_stmt* const held = statement();
    // A step after the last row would start a new run.
    if (std::exchange(firstRowPending_, false) || atEnd_)
        return !atEnd_;
    int result = sqlite3_step(held);
    if (result == SQLITE_ROW)
        return true;
    atEnd_ = true;
    if (result == SQLITE_DONE)
        return false;
    result = finalizeSlot(statement_);
    throw DbException(result, errorText(connection_));
}

int DbQuery::fieldText(int index, const char*& text)
{
    sqlite3_stmt* const held = statementWith(index);
    text = reinterpret_cast<const char*>(sqlite3_column_text(held, index));
    // A NULL column is null too; SQLite reports a failed conversion only by the connection's error code.
    if (!text && sqlite3_errcode(connection_) == SQLITE_NOMEM)
        throw DbException(SQLITE_NOMEM, errorText(connection_));
    return sqlite3_column_bytes(held, index);
}

int DbQuery::fieldType(int index)
{
    return sqlite3_column_type(statementWith(index), index);
}

int DbQuery::fieldInt(int index, int valueIfNull)
{
    return fieldType(index) == SQLITE_NULL ? valueIfNull : sqlite3_column_int(statement(), index);
}

void DbQuery::finalize()
{
    const StatementSlot slot = std::exchange(statement_, nullptr);
    if (ownsStatement_)
        throwIf(finalizeSlot(slot), connection_);
}

DbStatement::DbStatement(sqlite3* connection, StatementSlot statement) noexcept
    : connection_(connection), statement_(std::move(statement))
{
}

DbStatement& DbStatement::operator=(DbStatement&& other) noexcept
{
    if (this != &other) {
        finalizeSlot(statement_);
        connection_ = other.connection_;
        statement_ = std::move(other.statement_);
    }
    return *this;
}

DbStatement::~DbStatement()
{
    finalizeSlot(statement_);
}

sqlite3_stmt* DbStatement::statement() const
{
    if (!connection_)
        throwOwn(kNoDatabase);
    if (!statement_ || !*statement_)
        throwOwn(kNoStatement);
    return *statement_;
}

void DbStatement::bind(int index, const wxString& value)
{
    bindUtf8(index, toUtf8(view(value)));
}

void DbStatement::bindUtf8(int index, const std::string& value)
{
    throwIf(sqlite3_bind_text(statement(), index, value.c_str(), -1, SQLITE_TRANSIENT), kBadString);
}

void DbStatement::bind(int index, std::int32_t value)
{
    throwIf(sqlite3_bind_int(statement(), index, value), kBadInt);
}

void DbStatement::bind(int index, std::int64_t value)
{
    throwIf(sqlite3_bind_int64(statement(), index, value), kBadInt64);
}

int DbStatement::execDML()
{
    sqlite3_stmt* const held = statement();
    if (sqlite3_step(held) != SQLITE_DONE) {
        const int result = sqlite3_reset(held);
        throw DbException(result, errorText(connection_));
    }
    const int changes = sqlite3_changes(connection_);
    throwIf(sqlite3_reset(held), connection_);
    return changes;
}

DbQuery DbStatement::execQuery()
{
    sqlite3_stmt* const held = statement();
    int result = sqlite3_step(held);
    if (!isRowOrDone(result)) {
        result = sqlite3_reset(held);
        throw DbException(result, errorText(connection_));
    }
    return {connection_, statement_, result == SQLITE_DONE, false};
}

void DbStatement::reset()
{
    throwIf(sqlite3_reset(statement()), connection_);
}

void DbStatement::finalize()
{
    throwIf(finalizeSlot(statement_), connection_);
}

DbConnection::DbConnection(DbConnection&& other) noexcept
    : connection_(std::exchange(other.connection_, nullptr)), busyTimeoutMs_(other.busyTimeoutMs_)
{
}

DbConnection& DbConnection::operator=(DbConnection&& other) noexcept
{
    if (this != &other) {
        close();
        connection_ = std::exchange(other.connection_, nullptr);
        busyTimeoutMs_ = other.busyTimeoutMs_;
    }
    return *this;
}

DbConnection::~DbConnection()
{
    close();
}

void DbConnection::open(const wxString& path)
{
    close();
    const int result = sqlite3_open(toUtf8(view(path)).c_str(), &connection_);
    throwIf(result, connection_);
    sqlite3_busy_timeout(connection_, busyTimeoutMs_);
}

void DbConnection::close() noexcept
{
    // Unlike sqlite3_close, sqlite3_close_v2 also closes a connection whose statements outlive it, with the last of
    // them.
    sqlite3_close_v2(std::exchange(connection_, nullptr));
}

void DbConnection::check() const
{
    if (!connection_)
        throwOwn(kNoDatabase);
}

int DbConnection::execDML(const char* sql)
{
    check();
    char* error = nullptr;
    const int result = sqlite3_exec(connection_, sql, nullptr, nullptr, &error);
    const std::string detail = error ? error : "";
    sqlite3_free(error);
    if (result != SQLITE_OK)
        throw DbException(result, fromUtf8(detail));
    return sqlite3_changes(connection_);
}

int DbConnection::execDML(const wxString& sql)
{
    return execDML(toUtf8(view(sql)).c_str());
}

StatementSlot DbConnection::prepare(const char* sql) const
{
    check();
    auto slot = std::make_shared<sqlite3_stmt*>(nullptr);
    // Not the _v2 call, whose statements prepare themselves again after a change of the tables: the log shows such a
    // change as DB_SCHEMA. The detail stays empty, because scripts that read the log recognize this failure by that.
    if (const int result = sqlite3_prepare(connection_, sql, -1, slot.get(), nullptr); result != SQLITE_OK)
        throw DbException(result, wxString());
    return slot;
}

DbStatement DbConnection::compileStatement(const char* sql)
{
    return {connection_, prepare(sql)};
}

DbQuery DbConnection::execQuery(const char* sql)
{
    StatementSlot slot = prepare(sql);
    if (!*slot)
        throwOwn(kNoStatement);
    int result = sqlite3_step(*slot);
    if (!isRowOrDone(result)) {
        result = finalizeSlot(slot);
        throw DbException(result, errorText(connection_));
    }
    return {connection_, std::move(slot), result == SQLITE_DONE, true};
}

std::int64_t DbConnection::lastRowId() const
{
    check();
    return sqlite3_last_insert_rowid(connection_);
}

void DbConnection::beginTransaction(TransactionMode mode)
{
    switch (mode) {
    case TransactionMode::deferred:
        execDML(wxString(L"begin deferred transaction"));
        break;
    case TransactionMode::immediate:
    case TransactionMode::exclusive:
        execDML(wxString(L"begin immediate transaction"));
        break;
    default:
        execDML(wxString(L"begin transaction"));
    }
}

void DbConnection::commitTransaction()
{
    execDML(wxString(L"commit transaction"));
}

void DbConnection::rollbackTransaction()
{
    execDML(wxString(L"rollback transaction"));
}

Transaction::Transaction(DbConnection& connection, TransactionMode mode) : connection_(connection)
{
    connection_.beginTransaction(mode);
}

Transaction::~Transaction()
{
    rollback();
}

void Transaction::commit()
{
    connection_.commitTransaction();
    isOpen_ = false;
}

bool Transaction::rollback() noexcept
{
    try {
        if (std::exchange(isOpen_, false))
            connection_.rollbackTransaction();
        return true;
    } catch (...) {
        return false;
    }
}

} // namespace tavi
