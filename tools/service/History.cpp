#include "History.h"

#include <algorithm>
#include <cinttypes>
#include <cstdio>

#include "ContentStore.h"
#include "Text.h"

namespace service {
namespace {

Version readVersion(const Statement& row)
{
    return {row.integer(1),
            row.integer(2),
            static_cast<std::uint64_t>(row.integer(3)),
            static_cast<std::uint64_t>(row.integer(4)),
            static_cast<std::uint32_t>(row.integer(5)),
            row.text(6)};
}

std::string patchLine(const Version& version)
{
    char numbers[160];
    std::snprintf(numbers, sizeof numbers, "%" PRId64 ":%" PRIu32 ":%" PRIu32 ":%" PRId64 ":0:", version.time,
                  unixSeconds(version.modified), unixSeconds(version.created), version.size);
    char attributes[32];
    std::snprintf(attributes, sizeof attributes, ":0:%" PRIo32, version.attributes);
    return numbers + toUtf8(version.content) + attributes;
}

} // namespace

std::uint32_t unixSeconds(std::uint64_t fileTime)
{
    constexpr std::uint64_t epoch = 116444736000000000;
    constexpr std::uint64_t ticksPerSecond = 10000000;
    return fileTime < epoch
               ? 0
               : static_cast<std::uint32_t>(std::min<std::uint64_t>((fileTime - epoch) / ticksPerSecond, UINT32_MAX));
}

History::History(const Installation& installation) : database_(installation.historyDatabase())
{
    database_.run("CREATE TABLE IF NOT EXISTS versions(path TEXT, time INTEGER, size INTEGER, modified INTEGER,"
                  " created INTEGER, attributes INTEGER, content TEXT, PRIMARY KEY(path, time)) WITHOUT ROWID");
}

std::map<std::wstring, Version> History::newest()
{
    std::map<std::wstring, Version> found;
    Statement row(database_, "SELECT path, max(time), size, modified, created, attributes, content FROM versions"
                             " GROUP BY path");
    while (row.next())
        found.emplace(row.text(0), readVersion(row));
    return found;
}

std::optional<Version> History::find(const std::wstring& path, std::int64_t time)
{
    Statement row(database_, "SELECT path, time, size, modified, created, attributes, content FROM versions"
                             " WHERE path = ? AND time = ?");
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

std::string History::manifestText()
{
    std::string files;
    std::wstring current;
    Statement row(database_, "SELECT path, time, size, modified, created, attributes, content FROM versions"
                             " ORDER BY path, time");
    while (row.next()) {
        // An empty line parts the files; none follows the last line, where it would read as one more version.
        if (const std::wstring path = row.text(0); path != current) {
            files += (files.empty() ? "" : "\n\n") + toUtf8(path);
            current = path;
        }
        files += "\n" + patchLine(readVersion(row));
    }
    return "USER\n_hash|" + toUtf8(hashOf(files)) + "\nwritten by taviservice\n\n\nFILES\n" + files;
}

} // namespace service
