#include "statedb/Database.h"

#include <filesystem>
#include <functional>
#include <random>

#include <gtest/gtest.h>

using namespace tavi;

static DbConnection opened()
{
    DbConnection connection;
    connection.open(L":memory:");
    connection.execDML("CREATE TABLE t(a INTEGER PRIMARY KEY, b)");
    return connection;
}

TEST(Database, ReportsMisuseAndFailures)
{
    DbConnection connection = opened();
    connection.execDML("INSERT INTO t(b) VALUES(1),(-9223372036854775807-1)");
    DbStatement insert = connection.compileStatement("INSERT INTO t VALUES(1,?)");
    DbQuery failing = connection.execQuery("SELECT abs(b) FROM t ORDER BY a");
    EXPECT_TRUE(failing.nextRow());
    // In this order: a row that fails invalidates its statement and cursor.
    const std::pair<wxString, std::function<void()>> cases[] = {
        {L"WDB_ERROR[1000]: Invalid field index", [&] { failing.fieldInt(1, 0); }},
        {L"DB_ERROR[1]: ", [&] { connection.compileStatement("SELEC"); }}, // deliberately without detail
        {L"DB_ERROR[1]: near \"\xE9\": syntax error", [&] { connection.execDML(wxString(L"\xE9 x")); }},
        {L"DB_CONSTRAINT[19]: UNIQUE constraint failed: t.a", [&] { insert.execDML(); }},
        {L"DB_CANTOPEN[14]: unable to open database file", [] { DbConnection().open(L"/no such folder/x.db"); }},
        {L"DB_ERROR[1]: integer overflow", [&] { failing.nextRow(); }},
        {L"WDB_ERROR[1000]: Statement not accessible", [&] { failing.nextRow(); }},
        {L"WDB_ERROR[1000]: No Database opened", [&] { connection.close(), connection.execDML("SELECT 1"); }}};
    for (const auto& [expected, action] : cases) {
        try {
            action();
            ADD_FAILURE() << expected;
        } catch (const DbException& error) {
            EXPECT_EQ(error.message(), expected);
        }
    }
}

#ifdef _WIN32 // The native tests use the system's SQLite.
TEST(Database, ChecksPagesAndProtectsTheSchema)
{
    DbConnection connection = opened();
    EXPECT_EQ(connection.execQuery("PRAGMA trusted_schema").fieldInt(0, -1), 0);
    EXPECT_EQ(connection.execQuery("PRAGMA cell_size_check").fieldInt(0, -1), 1);
    connection.execDML("PRAGMA writable_schema=1");
    EXPECT_THROW(connection.execDML("DELETE FROM sqlite_master"), DbException);
}
#endif

TEST(Database, ReadsRowsAndKeepsBindings)
{
    DbConnection connection = opened();
    DbStatement insert = connection.compileStatement("INSERT INTO t(b) VALUES(?)");
    insert.bind(1, wxString(L"\x65E5\xE9"));
    insert.execDML();
    insert.execDML(); // the last binding again
    insert.bind(1, std::int64_t{0x7FFFFFFFFFFFFFFF});
    EXPECT_EQ(insert.execDML(), 1);
    EXPECT_EQ(connection.execDML("INSERT INTO t(b) VALUES(''),(NULL),(x'6100C3A9')"), 3);
    DbQuery rows = connection.execQuery("SELECT b FROM t ORDER BY a");
    const std::pair<int, std::string> expected[] = {
        {3, "\xE6\x97\xA5\xC3\xA9"}, {3, "\xE6\x97\xA5\xC3\xA9"}, {1, "9223372036854775807"}, {3, ""}, {5, ""},
        {4, {"a\0\xC3\xA9", 4}}};
    for (const auto& [type, content] : expected) {
        const char* text = nullptr;
        EXPECT_TRUE(rows.nextRow()) << content;
        EXPECT_EQ(rows.fieldType(0), type) << content;
        const auto length = static_cast<std::size_t>(rows.fieldText(0, text));
        EXPECT_EQ(std::string(text ? text : "", length), content);
        EXPECT_EQ(rows.fieldInt(0, 42) == 42, type == 5);
    }
    EXPECT_FALSE(rows.nextRow() || rows.nextRow());
}

TEST(Database, TransactionsLockByTheirModeAndEndWithTheirScope)
{
    const auto file = std::filesystem::temp_directory_path() / ("tavi-" + std::to_string(std::random_device()()));
    DbConnection connection, other;
    connection.open(file.wstring());
    other.open(file.wstring());
    other.execDML("PRAGMA busy_timeout=0; CREATE TABLE t(a)");
    for (int mode = 0; mode <= 4; ++mode) {
        const Transaction transaction(connection, static_cast<TransactionMode>(mode));
        EXPECT_EQ(other.execQuery("SELECT count(*) FROM t").fieldInt(0, -1), 0) << mode;
        if (mode == 2 || mode == 3)
            EXPECT_THROW(other.beginTransaction(TransactionMode::immediate), DbException) << mode;
        else
            EXPECT_TRUE(Transaction(other, TransactionMode::immediate).rollback()) << mode;
        connection.execDML("INSERT INTO t DEFAULT VALUES");
    }
    connection.close();
    other.close();
    std::filesystem::remove(file);
}
