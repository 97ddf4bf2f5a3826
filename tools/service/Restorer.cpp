#include "Restorer.h"

#include <algorithm>
#include <utility>

#include "Messages.h"
#include "Text.h"

namespace service {
namespace {

constexpr std::int64_t kLargestChunk = 65536;
// The readers take about a hundred messages a second.
constexpr DWORD kReportMilliseconds = 50;
constexpr DWORD kSettableAttributes = FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM |
                                      FILE_ATTRIBUTE_ARCHIVE | FILE_ATTRIBUTE_NOT_CONTENT_INDEXED;

struct Interrupted {};

std::wstring parentOf(const std::wstring& path)
{
    return path.substr(0, path.find_last_of(L'\\'));
}

void makeFolders(const std::wstring& path)
{
    if (path.size() <= 2 || CreateDirectoryW(longPath(path).c_str(), nullptr) || GetLastError() == ERROR_ALREADY_EXISTS)
        return;
    if (GetLastError() != ERROR_PATH_NOT_FOUND || parentOf(path) == path)
        throw systemFailure(path, GetLastError());
    makeFolders(parentOf(path));
    if (!CreateDirectoryW(longPath(path).c_str(), nullptr) && GetLastError() != ERROR_ALREADY_EXISTS)
        throw systemFailure(path, GetLastError());
}

void removeFile(const std::wstring& path)
{
    SetFileAttributesW(longPath(path).c_str(), FILE_ATTRIBUTE_NORMAL);
    DeleteFileW(longPath(path).c_str());
}

FILETIME fileTime(std::uint64_t time)
{
    return {static_cast<DWORD>(time), static_cast<DWORD>(time >> 32)};
}

Handle openFile(const std::wstring& path, DWORD access, DWORD disposition)
{
    const HANDLE file = CreateFileW(longPath(path).c_str(), access, FILE_SHARE_READ, nullptr, disposition, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE)
        throw systemFailure(path, GetLastError());
    return Handle(file);
}

} // namespace

Restorer::Restorer(const Installation& installation, const RunSettings& settings, StatusServer& status)
    : installation_(installation), settings_(settings), status_(status), store_(installation.storeFolder())
{
    thread_ = std::thread([this] { work(); });
}

Restorer::~Restorer()
{
    stop_ = true;
    SetEvent(interrupt_.get());
    thread_.join();
}

std::int64_t Restorer::oldestRequest()
{
    Database state(installation_.stateDatabase());
    Statement row(state, "SELECT ifnull(min(rowid), 0) FROM restores");
    row.next();
    return row.integer(0);
}

bool Restorer::isIdle()
{
    return !restoring_ && oldestRequest() == 0;
}

bool Restorer::cancel()
{
    const std::lock_guard guard(mutex_);
    if (!restoring_ && oldestRequest() == 0)
        return false;
    cancelled_ = true;
    SetEvent(interrupt_.get());
    return true;
}

void Restorer::pause(std::uint64_t milliseconds)
{
    if (WaitForSingleObject(interrupt_.get(), static_cast<DWORD>(milliseconds)) == WAIT_OBJECT_0)
        throw Interrupted();
}

void Restorer::work()
{
    while (!stop_) {
        try {
            if (const std::int64_t request = oldestRequest()) {
                restore(request);
                continue;
            }
            const std::lock_guard guard(mutex_);
            if (cancelled_ && !stop_ && oldestRequest() == 0) {
                cancelled_ = false;
                ResetEvent(interrupt_.get());
            }
        } catch (const Failure& failure) {
            printError(failure.text + L"\n");
        }
        WaitForSingleObject(interrupt_.get(), settings_.poll);
    }
}

bool Restorer::forget(std::int64_t id)
{
    while (!stop_) {
        try {
            Database state(installation_.stateDatabase());
            Transaction transaction(state);
            Statement(state, "DELETE FROM restore_files WHERE restore_id = ?").bind(1, id).next();
            Statement(state, "DELETE FROM restores WHERE rowid = ?").bind(1, id).next();
            transaction.commit();
            return true;
        } catch (const Failure& failure) {
            printError(failure.text + L"\n");
            WaitForSingleObject(interrupt_.get(), settings_.poll);
        }
    }
    return false;
}

void Restorer::restore(std::int64_t id)
{
    restoring_ = true;
    const std::wstring name = L"restore " + std::to_wstring(id) + L": ";
    std::vector<File> files;
    {
        Database state(installation_.stateDatabase());
        Statement row(state, "SELECT manifest_path, target_path, timestamp, file_size, overwrite FROM restore_files"
                             " WHERE restore_id = ? ORDER BY rowid");
        row.bind(1, id);
        while (row.next())
            files.push_back({row.text(0), row.text(1), row.integer(2), row.integer(3), row.integer(4) != 0});
    }
    std::int64_t total = 0;
    for (const File& file : files)
        total += std::max<std::int64_t>(file.size, 0);
    print(name + L"started, " + std::to_wstring(files.size()) + L" files, " + std::to_wstring(total) + L" bytes\n");
    status_.send(restoreStarted);
    unreported_ = 0;
    std::wstring end = L"ended";
    try {
        pause(settings_.search);
        status_.send(restoreTotal, static_cast<std::uint64_t>(total));
        History history(installation_);
        for (const File& file : files) {
            status_.send(itemStarted, 0, file.target);
            left_ = static_cast<std::uint64_t>(std::max<std::int64_t>(file.size, 0));
            try {
                restoreFile(history, file);
            } catch (const Failure& failure) {
                print(L"failed   " + failure.text + L"\n");
            }
            report(left_, true);
            status_.send(itemEnded);
        }
    } catch (const Interrupted&) {
        if (stop_) {
            print(name + L"left\n");
            restoring_ = false;
            return;
        }
        end = L"cancelled";
    }
    if (forget(id)) {
        status_.send(restoreEnded);
        print(name + end + L"\n");
    }
    const std::lock_guard guard(mutex_);
    restoring_ = false;
    // A cancel that came too late for this request is not meant for the next.
    if (!stop_) {
        cancelled_ = false;
        ResetEvent(interrupt_.get());
    }
}

void Restorer::report(std::uint64_t bytes, bool now)
{
    unreported_ += bytes;
    left_ -= std::min(bytes, left_);
    if (unreported_ == 0 || (!now && GetTickCount() - lastReport_ < kReportMilliseconds))
        return;
    status_.send(bytesDone, std::exchange(unreported_, 0));
    lastReport_ = GetTickCount();
}

void Restorer::copyContent(const std::wstring& from, const std::wstring& to)
{
    const Handle source = openFile(from, GENERIC_READ, OPEN_EXISTING);
    const Handle copy = openFile(to, GENERIC_WRITE, CREATE_ALWAYS);
    std::string part;
    while (true) {
        const std::int64_t rate = settings_.rate;
        part.resize(
            static_cast<std::size_t>(rate > 0 ? std::clamp<std::int64_t>(rate / 20, 1, kLargestChunk) : kLargestChunk));
        DWORD count = 0, written = 0;
        if (!ReadFile(source.get(), part.data(), static_cast<DWORD>(part.size()), &count, nullptr))
            throw systemFailure(from, GetLastError());
        if (count == 0)
            break;
        if (!WriteFile(copy.get(), part.data(), count, &written, nullptr) || written != count)
            throw systemFailure(to, GetLastError());
        report(count, false);
        pause(rate > 0 ? std::uint64_t{count} * 1000 / static_cast<std::uint64_t>(rate) : 0);
    }
}

void Restorer::restoreFile(History& history, const File& file)
{
    const auto version = history.find(file.path, file.time);
    if (!version || version->size == kDeletedSize)
        throw Failure{file.path + L": there is no such version"};
    const DWORD present = GetFileAttributesW(longPath(file.target).c_str());
    if (present != INVALID_FILE_ATTRIBUTES && !file.overwrite) {
        print(L"kept     " + file.target + L"\n");
        return;
    }
    makeFolders(parentOf(file.target));
    // Under its name the file appears whole, whatever happens before.
    const std::wstring incoming = parentOf(file.target) + L"\\incoming.tavi-part";
    removeFile(incoming);
    try {
        copyContent(store_.pathOf(version->content), incoming);
        {
            const Handle copy = openFile(incoming, FILE_WRITE_ATTRIBUTES, OPEN_EXISTING);
            const FILETIME created = fileTime(version->created), modified = fileTime(version->modified);
            if (!SetFileTime(copy.get(), version->created ? &created : nullptr, nullptr,
                             version->modified ? &modified : nullptr))
                throw systemFailure(incoming, GetLastError());
        }
        const DWORD attributes = version->attributes & kSettableAttributes;
        if (!SetFileAttributesW(longPath(incoming).c_str(), attributes ? attributes : FILE_ATTRIBUTE_NORMAL))
            throw systemFailure(incoming, GetLastError());
        const bool locked = present != INVALID_FILE_ATTRIBUTES && (present & FILE_ATTRIBUTE_READONLY);
        if (locked)
            SetFileAttributesW(longPath(file.target).c_str(), present & ~DWORD{FILE_ATTRIBUTE_READONLY});
        // A file that has come meanwhile is replaced no more than one that was there.
        if (!MoveFileExW(longPath(incoming).c_str(), longPath(file.target).c_str(),
                         file.overwrite ? MOVEFILE_REPLACE_EXISTING : 0)) {
            const DWORD error = GetLastError();
            if (locked)
                SetFileAttributesW(longPath(file.target).c_str(), present);
            throw systemFailure(file.target, error);
        }
    } catch (...) {
        removeFile(incoming);
        throw;
    }
    print(L"restored " + file.target + L"\n");
}

} // namespace service
