#include "Output.h"

namespace filemanager {

std::wstring hexCode(HRESULT result)
{
    wchar_t text[16];
    wsprintfW(text, L"0x%08x", static_cast<unsigned>(result));
    return text;
}

std::wstring readUtf8File(const std::wstring& path)
{
    const HANDLE file =
        CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE)
        throw Failure{L"cannot read " + path};
    std::string bytes;
    char part[4096];
    for (DWORD count = 0; ReadFile(file, part, sizeof part, &count, nullptr) && count > 0;)
        bytes.append(part, count);
    CloseHandle(file);
    if (bytes.compare(0, 3, "\xEF\xBB\xBF") == 0)
        bytes.erase(0, 3);
    const int length = MultiByteToWideChar(CP_UTF8, 0, bytes.data(), static_cast<int>(bytes.size()), nullptr, 0);
    std::wstring text(static_cast<std::size_t>(length), L'\0');
    MultiByteToWideChar(CP_UTF8, 0, bytes.data(), static_cast<int>(bytes.size()), text.data(), length);
    return text;
}

Output::~Output()
{
    if (log_ != INVALID_HANDLE_VALUE)
        CloseHandle(log_);
}

void Output::openLog(const std::wstring& path)
{
    log_ = CreateFileW(path.c_str(), FILE_APPEND_DATA, FILE_SHARE_READ, nullptr, CREATE_ALWAYS, 0, nullptr);
    if (log_ == INVALID_HANDLE_VALUE)
        throw Failure{L"cannot write " + path};
}

void Output::line(std::wstring_view text)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    if (recording_)
        record_.append(text).append(1, L'\n');
    if (!muted_)
        write(text, STD_OUTPUT_HANDLE);
}

void Output::error(std::wstring_view text)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    write(text, STD_ERROR_HANDLE);
}

void Output::mute(bool muted)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    muted_ = muted;
}

void Output::startRecord()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    recording_ = true;
    record_.clear();
}

void Output::stopRecord()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    recording_ = false;
}

std::wstring Output::record()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    return record_;
}

void Output::write(std::wstring_view text, DWORD standardHandle)
{
    const int wide = static_cast<int>(text.size());
    const int length = WideCharToMultiByte(CP_UTF8, 0, text.data(), wide, nullptr, 0, nullptr, nullptr);
    std::string bytes(static_cast<std::size_t>(length), '\0');
    WideCharToMultiByte(CP_UTF8, 0, text.data(), wide, bytes.data(), length, nullptr, nullptr);
    bytes += '\n';
    for (const HANDLE to : {GetStdHandle(standardHandle), log_}) {
        DWORD written = 0;
        if (to && to != INVALID_HANDLE_VALUE)
            WriteFile(to, bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr);
    }
}

} // namespace filemanager
