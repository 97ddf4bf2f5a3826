#include "Text.h"

#include <cwchar>

#include <windows.h>

namespace tools {
namespace {

void writeLine(DWORD standardHandle, std::wstring_view line)
{
    const std::string bytes = toUtf8(line) + "\n";
    DWORD written = 0;
    WriteFile(GetStdHandle(standardHandle), bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr);
}

} // namespace

Failure systemFailure(const std::wstring& what, unsigned long error)
{
    wchar_t text[512] = L"";
    FormatMessageW(FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_MAX_WIDTH_MASK, nullptr,
                   error, 0, text, 512, nullptr);
    return {what + L": " + text + L"(error " + std::to_wstring(error) + L")"};
}

std::string toUtf8(std::wstring_view text)
{
    const int length = static_cast<int>(text.size());
    const int size = WideCharToMultiByte(CP_UTF8, 0, text.data(), length, nullptr, 0, nullptr, nullptr);
    std::string bytes(static_cast<std::size_t>(size), '\0');
    WideCharToMultiByte(CP_UTF8, 0, text.data(), length, bytes.data(), size, nullptr, nullptr);
    return bytes;
}

std::wstring fromUtf8(std::string_view text)
{
    const int length = static_cast<int>(text.size());
    const int size = MultiByteToWideChar(CP_UTF8, 0, text.data(), length, nullptr, 0);
    std::wstring wide(static_cast<std::size_t>(size), L'\0');
    MultiByteToWideChar(CP_UTF8, 0, text.data(), length, wide.data(), size);
    return wide;
}

std::int64_t toNumber(const std::wstring& text)
{
    wchar_t* end = nullptr;
    const std::int64_t value = std::wcstoll(text.c_str(), &end, 10);
    if (text.empty() || *end || value < 0)
        throw Failure{L"not a number: " + text};
    return value;
}

void print(std::wstring_view line)
{
    writeLine(STD_OUTPUT_HANDLE, line);
}

void printError(std::wstring_view line)
{
    writeLine(STD_ERROR_HANDLE, line);
}

} // namespace tools
