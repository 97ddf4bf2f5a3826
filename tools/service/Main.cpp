#include <exception>

#include <windows.h>

#include "Backup.h"
#include "common/Commands.h"
#include "common/Text.h"
#include "Installation.h"
#include "Run.h"

namespace {

using tools::Arguments;
using tools::toNumber;

void backUp(const Arguments& arguments)
{
    service::backUp(arguments[0], arguments.size() > 1 ? std::optional(toNumber(arguments[1])) : std::nullopt);
}

void run(const Arguments& arguments)
{
    service::run(arguments.empty() ? 0 : toNumber(arguments[0]), arguments.size() < 2 ? 0 : toNumber(arguments[1]));
}

} // namespace

int wmain(int count, wchar_t** words)
{
    try {
        const tools::Commands commands({
            {L"install", L"FOLDER", 1, 1, [](const Arguments& arguments) { service::install(arguments[0]); }},
            {L"backup", L"FOLDER [UNIXTIME]", 1, 2, backUp},
            {L"run", L"[BYTES_PER_SECOND [SEARCH_MS]]", 0, 2, run},
        });
        if (count < 2)
            throw tools::Failure{L"usage: taviservice install | backup | run"};
        commands.run(words[1], Arguments(words + 2, words + count));
        return 0;
    } catch (const tools::Failure& failure) {
        tools::printError(L"taviservice: " + failure.text);
    } catch (const std::exception& error) {
        tools::printError(L"taviservice: " + tools::fromUtf8(error.what()));
    }
    return 1;
}
