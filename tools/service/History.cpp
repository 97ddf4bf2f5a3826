#include "History.h"

namespace service {
namespace {

// Reads the columns of the table behind the path.
Version readVersion(const Statement& row)
{
    return {row.integer(1),
            row.integer(2),
            static_cast<std::uint64_t>(row.integer(3)),
            static_cast<std::uint64_t>(row.integer(4)),
            static_cast<std::uint32_t>(row.integer(5)),
            row.text(6)};
}

} // namespace

History::History(const Installation& installation) : database_(installation.historyDatabase())
{
    database_.run("CREATE TABLE IF NOT EXISTS versions(path TEXT, time INTEGER, size INTEGER, modified INTEGER,"
                  " created INTEGER, attributes INTEGER, content TEXT, PRIMARY KEY(path, time)) WITHOUT ROWID");
}

std::map<std::wstring, Version> History::newest()
{
    std::map<std::wstring, Version> found;
    forEach([&](const std::wstring& path, const Version& version) { found[path] = version; });
    return found;
}

std::optional<Version> History::find(const std::wstring& path, std::int64_t time)
{
    Statement row(database_, "SELECT * FROM versions WHERE path = ? AND time = ?");
    row.bind(1, path).bind(2, time);
    return row.next() ? std::optional(readVersion(row)) : std::nullopt;
}

std::int64_t History::lastRun()
{
    Statement row(database_, "SELECT ifnull(max(time), 0) FROM versions");
    row.next();
    return row.integer(0);
}

void History::addRun(const std::map<std::wstring, Version>& versions)
{
    Transaction transaction(database_);
    Statement insert(database_, "INSERT INTO versions VALUES(?,?,?,?,?,?,?)");
    for (const auto& [path, version] : versions) {
        insert.bind(1, path)
            .bind(2, version.time)
            .bind(3, version.size)
            .bind(4, static_cast<std::int64_t>(version.modified))
            .bind(5, static_cast<std::int64_t>(version.created))
            .bind(6, std::int64_t{version.attributes})
            .bind(7, version.content)
            .next();
    }
    transaction.commit();
}

void History::forEach(const std::function<void(const std::wstring& path, const Version& version)>& visit)
{
    Statement row(database_, "SELECT * FROM versions ORDER BY path, time");
    while (row.next())
        visit(row.text(0), readVersion(row));
}

} // namespace service
