#include "Database.h"

#include "common/Text.h"

namespace service {
namespace {

constexpr int kBusyMs = 60000;

[[noreturn]] void fail(sqlite3* handle)
{
    throw tools::Failure{L"database: " + tools::fromUtf8(sqlite3_errmsg(handle))};
}

} // namespace

Database::Database(const std::wstring& path)
{
    if (sqlite3_open(tools::toUtf8(path).c_str(), &handle_) != SQLITE_OK) {
        const std::wstring text = path + L": " + tools::fromUtf8(sqlite3_errmsg(handle_));
        sqlite3_close(handle_);
        throw tools::Failure{text};
    }
    sqlite3_busy_timeout(handle_, kBusyMs);
}

Database::~Database()
{
    sqlite3_close(handle_);
}

void Database::run(const char* sql)
{
    if (sqlite3_exec(handle_, sql, nullptr, nullptr, nullptr) != SQLITE_OK)
        fail(handle_);
}

Transaction::Transaction(Database& database) : database_(database)
{
    database_.run("BEGIN IMMEDIATE");
}

Transaction::~Transaction()
{
    if (open_)
        sqlite3_exec(database_.handle(), "ROLLBACK", nullptr, nullptr, nullptr);
}

void Transaction::commit()
{
    database_.run("COMMIT");
    open_ = false;
}

Statement::Statement(Database& database, const char* sql) : database_(database)
{
    check(sqlite3_prepare_v2(database.handle(), sql, -1, &handle_, nullptr));
}

Statement::~Statement()
{
    sqlite3_finalize(handle_);
}

void Statement::check(int result) const
{
    if (result != SQLITE_OK)
        fail(database_.handle());
}

Statement& Statement::bind(int parameter, std::int64_t value)
{
    check(sqlite3_bind_int64(handle_, parameter, value));
    return *this;
}

Statement& Statement::bind(int parameter, std::wstring_view text)
{
    const std::string bytes = tools::toUtf8(text);
    check(sqlite3_bind_text(handle_, parameter, bytes.data(), static_cast<int>(bytes.size()), SQLITE_TRANSIENT));
    return *this;
}

Statement& Statement::bindBlob(int parameter, std::string_view bytes)
{
    check(sqlite3_bind_blob(handle_, parameter, bytes.data(), static_cast<int>(bytes.size()), SQLITE_TRANSIENT));
    return *this;
}

bool Statement::next()
{
    const int result = sqlite3_step(handle_);
    if (result == SQLITE_ROW)
        return true;
    check(sqlite3_reset(handle_));
    return false;
}

std::int64_t Statement::integer(int column) const
{
    return sqlite3_column_int64(handle_, column);
}

std::wstring Statement::text(int column) const
{
    const auto* const bytes = static_cast<const char*>(sqlite3_column_blob(handle_, column));
    return bytes ? tools::fromUtf8({bytes, static_cast<std::size_t>(sqlite3_column_bytes(handle_, column))}) : L"";
}

} // namespace service
