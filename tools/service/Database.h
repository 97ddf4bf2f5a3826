#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include <sqlite3.h>

namespace service {

class Database {
  public:
    explicit Database(const std::wstring& path);
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;
    ~Database();

    void run(const char* sql);
    sqlite3* handle() const
    {
        return handle_;
    }

  private:
    sqlite3* handle_ = nullptr;
};

// The destructor undoes it unless it was committed.
class Transaction {
  public:
    explicit Transaction(Database& database);
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    ~Transaction();

    void commit();

  private:
    Database& database_;
    bool open_ = true;
};

// Parameters count from 1, columns from 0.
class Statement {
  public:
    Statement(Database& database, const char* sql);
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;
    ~Statement();

    Statement& bind(int parameter, std::int64_t value);
    Statement& bind(int parameter, std::wstring_view text);
    Statement& bindBlob(int parameter, std::string_view bytes);
    // Returns false after the last row; the statement may then be bound and run again.
    bool next();

    std::int64_t integer(int column) const;
    std::wstring text(int column) const;

  private:
    void check(int result) const;

    Database& database_;
    sqlite3_stmt* handle_ = nullptr;
};

} // namespace service
