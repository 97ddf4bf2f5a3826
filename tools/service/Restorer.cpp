#include "Restorer.h"

#include <algorithm>
#include <exception>
#include <fstream>
#include <utility>

#include <windows.h>

#include "common/Text.h"
#include "Messages.h"

namespace service {
namespace {

using tools::Failure;

constexpr DWORD kPollMs = 250;
// A client takes about a hundred messages a second.
constexpr DWORD kReportMs = 50;
constexpr std::int64_t kMaxChunkBytes = 65536;
constexpr std::int64_t kChunksPerSecond = 20;

// The service stops, or the restore was cancelled.
struct Interrupted {};

void setModifiedTime(const std::filesystem::path& path, std::uint64_t time)
{
    const HANDLE file =
        CreateFileW(path.c_str(), FILE_WRITE_ATTRIBUTES, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE)
        throw tools::systemFailure(path.wstring(), GetLastError());
    const tools::Handle owned(file);
    const FILETIME modified = {static_cast<DWORD>(time), static_cast<DWORD>(time >> 32)};
    if (!SetFileTime(file, nullptr, nullptr, &modified))
        throw tools::systemFailure(path.wstring(), GetLastError());
}

} // namespace

Restorer::Restorer(Installation installation, const RestoreSettings& settings, StatusServer& status)
    : installation_(std::move(installation)), settings_(settings), status_(status)
{
    thread_ = std::thread([this] { work(); });
}

Restorer::~Restorer()
{
    stop_ = true;
    SetEvent(interrupt_.get());
    thread_.join();
}

bool Restorer::isIdle()
{
    return !restoring_ && oldestRequest() == 0;
}

bool Restorer::cancel()
{
    const std::lock_guard guard(mutex_);
    if (isIdle())
        return false;
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
            while (const std::int64_t request = stop_ ? 0 : oldestRequest())
                restore(request);
        } catch (const Failure& failure) {
            tools::printError(failure.text);
        }
        WaitForSingleObject(interrupt_.get(), kPollMs);
    }
}

void Restorer::restore(std::int64_t request)
{
    restoring_ = true;
    const std::wstring name = L"restore " + std::to_wstring(request) + L": ";
    std::wstring end = L"ended";
    try {
        const std::vector<File> files = filesOf(request);
        tools::print(name + L"started, " + std::to_wstring(files.size()) + L" files");
        restoreFiles(files);
    } catch (const Interrupted&) {
        end = stop_ ? L"left" : L"cancelled";
    }
    if (!stop_) {
        deleteRequest(request);
        status_.send(kRestoreEnded);
    }
    tools::print(name + end);
    const std::lock_guard guard(mutex_);
    restoring_ = false;
    // A cancel that came too late for this request must not cancel the next one.
    if (!stop_)
        ResetEvent(interrupt_.get());
}

void Restorer::restoreFiles(const std::vector<File>& files)
{
    status_.send(kRestoreStarted);
    pause(settings_.searchMs);
    std::uint64_t total = 0;
    for (const File& file : files)
        total += static_cast<std::uint64_t>(std::max<std::int64_t>(file.size, 0));
    status_.send(kRestoreTotal, total);
    History history(installation_);
    for (const File& file : files) {
        status_.send(kItemStarted, 0, file.target);
        try {
            restoreFile(history, file);
        } catch (const Failure& failure) {
            tools::print(L"failed   " + failure.text);
        } catch (const std::exception& error) {
            tools::print(L"failed   " + tools::fromUtf8(error.what()));
        }
        reportBytes();
        status_.send(kItemEnded);
    }
}

void Restorer::restoreFile(History& history, const File& file)
{
    const std::filesystem::path target = file.target;
    const auto version = history.find(file.path, file.time);
    if (!version || version->size == kDeletedSize)
        throw Failure{file.path + L": there is no such version"};
    if (!file.overwrite && std::filesystem::exists(target))
        throw Failure{file.target + L": exists"};
    std::filesystem::create_directories(target.parent_path());
    // The file appears under its name only when it is complete.
    const std::filesystem::path incoming = target.parent_path() / L"incoming.tavi-part";
    try {
        copyContent(installation_.contentFile(version->content), incoming);
        setModifiedTime(incoming, version->modified);
        std::filesystem::rename(incoming, target);
    } catch (...) {
        std::filesystem::remove(incoming);
        throw;
    }
    tools::print(L"restored " + file.target);
}

void Restorer::copyContent(const std::filesystem::path& from, const std::filesystem::path& to)
{
    std::ifstream source(from, std::ios::binary);
    std::ofstream copy(to, std::ios::binary);
    std::vector<char> chunk;
    while (source && copy) {
        const std::int64_t rate = settings_.bytesPerSecond;
        const std::int64_t size =
            rate > 0 ? std::clamp<std::int64_t>(rate / kChunksPerSecond, 1, kMaxChunkBytes) : kMaxChunkBytes;
        chunk.resize(static_cast<std::size_t>(size));
        source.read(chunk.data(), static_cast<std::streamsize>(chunk.size()));
        const auto count = static_cast<std::uint64_t>(source.gcount());
        copy.write(chunk.data(), source.gcount());
        unreported_ += count;
        if (GetTickCount() - lastReport_ >= kReportMs)
            reportBytes();
        pause(rate > 0 ? count * 1000 / static_cast<std::uint64_t>(rate) : 0);
    }
    copy.close();
    if (!source.eof() || !copy)
        throw Failure{to.wstring() + L": cannot be copied"};
}

void Restorer::reportBytes()
{
    if (unreported_ > 0)
        status_.send(kBytesDone, std::exchange(unreported_, 0));
    lastReport_ = GetTickCount();
}

std::int64_t Restorer::oldestRequest()
{
    Database state(installation_.stateDatabase());
    Statement row(state, "SELECT ifnull(min(rowid), 0) FROM restores");
    row.next();
    return row.integer(0);
}

std::vector<Restorer::File> Restorer::filesOf(std::int64_t request)
{
    std::vector<File> files;
    Database state(installation_.stateDatabase());
    Statement row(state, "SELECT manifest_path, target_path, timestamp, file_size, overwrite FROM restore_files"
                         " WHERE restore_id = ? ORDER BY rowid");
    row.bind(1, request);
    while (row.next())
        files.push_back({row.text(0), row.text(1), row.integer(2), row.integer(3), row.integer(4) != 0});
    return files;
}

void Restorer::deleteRequest(std::int64_t request)
{
    Database state(installation_.stateDatabase());
    Transaction transaction(state);
    Statement(state, "DELETE FROM restore_files WHERE restore_id = ?").bind(1, request).next();
    Statement(state, "DELETE FROM restores WHERE rowid = ?").bind(1, request).next();
    transaction.commit();
}

} // namespace service
