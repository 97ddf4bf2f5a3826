#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tools {

// Ends a command; `text` is for the person who reads the program's output.
struct Failure {
    std::wstring text;
};

// Returns a failure of `what` with the text and the number of a system error.
Failure systemFailure(const std::wstring& what, unsigned long error);

std::string toUtf8(std::wstring_view text);
std::wstring fromUtf8(std::string_view text);

// Returns the value of a decimal number without a sign. Throws a Failure for any other text.
std::int64_t toNumber(const std::wstring& text);

// Write one line of UTF-8 to the standard output or the standard error, in one write. Any thread.
void print(std::wstring_view line);
void printError(std::wstring_view line);

} // namespace tools
