#include "Reports.h"

#include <algorithm>
#include <string>
#include <vector>

#include "Database.h"
#include "StoredManifest.h"
#include "Text.h"

namespace service {
namespace {

void printTable(Database& database, const std::wstring& title, const char* sql)
{
    Statement row(database, sql);
    const auto columns = static_cast<std::size_t>(row.columns());
    std::vector<std::vector<std::wstring>> lines(1);
    for (std::size_t at = 0; at < columns; ++at)
        lines[0].push_back(row.columnName(static_cast<int>(at)));
    while (row.next()) {
        auto& cells = lines.emplace_back();
        for (std::size_t at = 0; at < columns; ++at)
            cells.push_back(row.text(static_cast<int>(at)));
    }
    std::vector<std::size_t> widths(columns);
    for (const auto& cells : lines) {
        for (std::size_t at = 0; at < columns; ++at)
            widths[at] = std::max(widths[at], cells[at].size());
    }
    std::wstring text = title + L"\n";
    for (std::size_t line = 0; line < lines.size(); ++line) {
        std::wstring whole = L"  ";
        for (std::size_t at = 0; at < columns; ++at)
            whole += lines[line][at] + std::wstring(widths[at] - lines[line][at].size() + 2, L' ');
        text += whole.substr(0, whole.find_last_not_of(L' ') + 1) + L"\n";
        if (line == 0) {
            std::wstring rule = L"  ";
            for (const std::size_t width : widths)
                rule += std::wstring(width, L'-') + L"  ";
            text += rule.substr(0, rule.find_last_not_of(L' ') + 1) + L"\n";
        }
    }
    print(text);
}

} // namespace

void printRequests(const Installation& installation)
{
    Database state(installation.stateDatabase());
    // Quoted, so that an empty text can be told from no value.
    printTable(state, L"restores",
               "SELECT rowid AS id, datetime(request_time, 'unixepoch', 'localtime') AS request_time,"
               " quote(machine_id) AS machine_id, quote(machine_alias) AS machine_alias,"
               " quote(encryption_key) AS encryption_key FROM restores ORDER BY rowid");
    print(L"\n");
    printTable(state, L"restore_files",
               "SELECT restore_id, overwrite, file_size, timestamp,"
               " datetime(timestamp, 'unixepoch', 'localtime') AS backup_time,"
               " datetime(ctime, 'unixepoch', 'localtime') AS ctime, printf('%o', attributes) AS attributes,"
               " manifest_path, target_path FROM restore_files ORDER BY restore_id, rowid");
}

void printManifest(const Installation& installation)
{
    Database state(installation.stateDatabase());
    print(fromUtf8(readManifest(state)) + L"\n");
}

} // namespace service
