#pragma once

#include <string>
#include <string_view>

namespace service {

// What ends a command: printed, and the exit code is 1.
struct Failure {
    std::wstring text;
};

// `what` with the words and the number of a system error.
Failure systemFailure(const std::wstring& what, unsigned long error);

std::string toUtf8(std::wstring_view text);
std::wstring fromUtf8(std::string_view text);

// Whole texts, to a console as such and to a file or pipe as UTF-8.
void print(std::wstring_view text);
void printError(std::wstring_view text);

} // namespace service
