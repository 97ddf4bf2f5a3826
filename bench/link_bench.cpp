#include <algorithm>
#include <atomic>
#include <cstring>
#include <future>
#include <stdexcept>
#include <thread>

#include <windows.h>
#include <wx/datetime.h>

#include "bench/Bench.h"
#include "bench/InstalledService.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "link/MessageReader.h"
#include "link/PipeIo.h"
#include "link/StatusListener.h"
#include "manifest/ManifestWatcher.h"

namespace tavi::bench {
namespace {

using Bytes = std::vector<unsigned char>;

constexpr const wchar_t* kStatusPipe = L"\\\\.\\pipe\\tavistatus";

// The messages of a restore, again and again.
Bytes streamOf(unsigned messages)
{
    const auto path = std::make_shared<wxString>(L"C:\\Users\\Ana\\Documents\\R\u00E9sum\u00E9 of last year.txt");
    const auto none = std::make_shared<wxString>();
    Bytes stream;
    for (unsigned i = 0; i < messages; ++i) {
        constexpr EventType kTypes[] = {EventType::restoreItem, EventType::restoreDone, EventType::restoreDone,
                                        EventType::restoreItemEnded};
        const EventType type = i == 0 ? EventType::restoreStarted : i == 1 ? EventType::restoreTotal : kTypes[i % 4];
        const auto frame = MessageBuffer::create();
        EventMessage(type, 0, type == EventType::restoreTotal ? 1u << 30 : 65536, 0,
                     type == EventType::restoreItem ? path : none)
            .serialize(*frame);
        stream.insert(stream.end(), frame->data(), frame->data() + frame->length());
    }
    return stream;
}

// A pipe without the reader's pause, which would hide the cost of everything else.
class UnpacedSource final : public ByteSource {
  public:
    explicit UnpacedSource(HANDLE pipe) : pipe_(pipe) {}
    bool peek(std::uint32_t& available) override
    {
        DWORD count = 0;
        const bool open = PeekNamedPipe(pipe_, nullptr, 0, nullptr, &count, nullptr);
        available = count;
        return open;
    }
    void pause() override {}
    bool read(unsigned char* into, std::uint32_t size) override
    {
        DWORD count = 0;
        return ReadFile(pipe_, into, size, &count, nullptr);
    }

  private:
    const HANDLE pipe_;
};

// Returns both ends of a new pipe that holds the whole stream: the service's and the module's.
std::pair<FileHandle, FileHandle> filledPipe(const Bytes& stream)
{
    constexpr const wchar_t* kName = L"\\\\.\\pipe\\tavi-link-bench";
    FileHandle server(CreateNamedPipeW(kName, PIPE_ACCESS_OUTBOUND, PIPE_TYPE_BYTE, 1, 1 << 22, 0, 0, nullptr));
    FileHandle client(CreateFileW(kName, GENERIC_READ, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
    DWORD count = 0;
    if (!client || !WriteFile(server.get(), stream.data(), static_cast<DWORD>(stream.size()), &count, nullptr))
        throw std::runtime_error("cannot create and fill a pipe");
    return {std::move(server), std::move(client)};
}

// Reads one frame by the system calls that every reader needs, and no others.
bool bareRead(HANDLE pipe, DWORD pauseMs)
{
    unsigned char bytes[1024];
    DWORD count = 0;
    std::uint32_t length;
    const BOOL open = PeekNamedPipe(pipe, nullptr, 0, nullptr, &count, nullptr);
    if (open && pauseMs > 0)
        Sleep(pauseMs);
    if (!open || !ReadFile(pipe, bytes, kFrameHeaderSize, &count, nullptr))
        return false;
    std::memcpy(&length, bytes + 4, sizeof length);
    return ReadFile(pipe, bytes, length, &count, nullptr);
}

// Returns a work that fills a pipe and reads all messages by one call of `readOne` each. Adds the processor time of the
// calls to `spent`.
template <class ReadOne>
std::function<void()> reading(unsigned messages, double& spent, ReadOne readOne)
{
    return [stream = streamOf(messages), messages, &spent, readOne] {
        const auto [server, client] = filledPipe(stream);
        const double start = processorSeconds();
        unsigned read = 0;
        while (read < messages && readOne(client.get()))
            ++read;
        spent += processorSeconds() - start;
        if (read != messages)
            throw std::runtime_error("messages were lost: " + std::to_string(messages - read));
    };
}

void reportMessages(Bench& bench)
{
    const StopCheck never = [] { return false; };
    std::unique_ptr<PipeMessage> message;
    TransferStatus status(true, [] { return static_cast<std::uint32_t>(GetTickCount()); });
    const auto bare = [](DWORD pauseMs) { return [=](HANDLE pipe) { return bareRead(pipe, pauseMs); }; };
    const auto readAndDispatch = [&](HANDLE pipe) {
        const bool read = readMessage(pipe, &message, never);
        if (read)
            dispatch(std::move(message));
        return read;
    };
    const auto readUnpaced = [&](HANDLE pipe) {
        UnpacedSource source(pipe);
        message = readFrame(source, never);
        if (message)
            status.apply(*message);
        return message != nullptr;
    };
    double required = 0, ours = 0;
    const unsigned paced = bench.quick ? 100 : 200;
    const auto pacedTimes =
        medianSeconds(bench.quick ? 3 : 5, {reading(paced, required, bare(10)), reading(paced, ours, readAndDispatch)});
    bench.report("message from pipe to status / required calls", pacedTimes[1] / pacedTimes[0], 1.05, "x");

    // Small parts in turns, since the cost of a system call changes from second to second.
    constexpr unsigned kPart = 250;
    required = ours = 0;
    const auto times =
        medianSeconds(bench.quick ? 51 : 201, {reading(kPart, required, bare(0)), reading(kPart, ours, readUnpaced)});
    bench.report("message without the pause / required calls", times[1] / times[0], 2, "x");
    bench.report("the same in processor time", ours / required, 2, "x");
    bench.report("message without the pause, from a pipe", times[1] / kPart * 1e6, kNoBound, "us");
}

// The idle module: loops of its threads, and the system calls that each of them needs.
constexpr unsigned kThreads = 32;
std::atomic<bool> stopAll{false};

void listen()
{
    listenToStatus([] { return stopAll.load(); });
}

FileHandle openStatusPipe()
{
    return FileHandle(CreateFileW(kStatusPipe, GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr));
}

void bareAttempts()
{
    while (!stopAll) {
        openStatusPipe();
        for (int i = 0; i < 100 && !stopAll; ++i)
            Sleep(50);
    }
}

void barePolling()
{
    const FileHandle pipe = openStatusPipe();
    if (!pipe)
        throw std::runtime_error("cannot open the pipe of the silent service");
    DWORD count = 0;
    while (!stopAll && PeekNamedPipe(pipe.get(), nullptr, 0, nullptr, &count, nullptr))
        Sleep(10);
}

// Polls as the module does, each call with a state of its own.
void watch()
{
    WatcherState state;
    WatcherServices services;
    services.loadManifest = [] { return Manifest::parse(wxString()); };
    services.manifestTime = readManifestTime;
    services.now = [] { return wxDateTime::Now().GetValue().GetValue(); };
    services.sleep = Sleep;
    services.isStopping = [] { return stopAll.load(); };
    services.buildExclusions = [](bool) {};
    runManifestWatcher(state, services);
}

void bareWatch()
{
    const wxString name = getSettingsKeyName().AfterFirst(L'\\');
    while (!stopAll) {
        for (int i = 0; i < 10 && !stopAll; ++i)
            Sleep(500);
        RegistryKey key;
        wchar_t text[64];
        DWORD size = sizeof text;
        RegOpenKeyExW(HKEY_LOCAL_MACHINE, name.wc_str(), 0, KEY_READ | KEY_WOW64_32KEY, key.out());
        RegQueryValueExW(key.get(), L"options.manifestmtime", nullptr, nullptr, reinterpret_cast<BYTE*>(text), &size);
    }
}

// The module's loop and the bare one.
constexpr struct {
    const char* name;
    void (*loops[2])();
} kPairs[] = {{"listener without a service", {listen, bareAttempts}},
              {"watcher", {watch, bareWatch}},
              {"listener of a silent service", {listen, barePolling}}};

// Measures some of the pairs, all loops at the same time and each in its own process.
void reportIdle(Bench& bench, std::size_t first, std::size_t end)
{
    const std::string seconds = bench.quick ? "5" : "60";
    constexpr double kStepMs = kClockStepSeconds * 1e3;
    const double perMinute = (bench.quick ? 12.0 : 1.0) / kThreads;
    std::vector<std::future<double>> times;
    for (std::size_t loop = 2 * first; loop < 2 * end; ++loop)
        times.push_back(std::async(std::launch::async, [=, &bench] {
            return bench.inOwnProcess("idle", {std::to_string(loop), seconds})[0] * perMinute;
        }));
    for (std::size_t pair = first; pair < end; ++pair) {
        const std::string name = kPairs[pair].name;
        const double ours = times[2 * (pair - first)].get(), required = times[2 * (pair - first) + 1].get();
        bench.report(name + ", a minute", ours, kNoBound, "ms");
        bench.report(name + ", a minute of the required calls", required, kNoBound, "ms");
        // A ratio of fewer steps of the clock would be chance.
        if (std::min(ours, required) >= 10 * kStepMs * perMinute)
            bench.report(name + " / required calls", ours / required, 1.5, "x");
    }
}

} // namespace

// Returns the processor time of many threads in a loop, so that the steps of the clock do not matter.
std::vector<double> measureIdle(const Arguments& arguments)
{
    const std::size_t loop = std::stoul(arguments[0]);
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < kThreads; ++i)
        threads.emplace_back(kPairs[loop / 2].loops[loop % 2]);
    Sleep(1000); // the start of the threads does not count
    const double start = processorSeconds();
    Sleep(static_cast<DWORD>(std::stoul(arguments[1]) * 1000));
    const double spentMs = (processorSeconds() - start) * 1e3;
    stopAll = true;
    for (std::thread& thread : threads)
        thread.join();
    return {spentMs};
}

void runLink(Bench& bench)
{
    reportMessages(bench);
    const test::InstalledService service;
    wxRegKey settings = settingsKey();
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2020-01-02 03:04:05");
    if (!readManifestTime())
        throw std::runtime_error("the time of the manifest was not read");
    reportIdle(bench, 0, 2);
    std::vector<FileHandle> pipes;
    for (unsigned i = 0; i < 2 * kThreads; ++i)
        pipes.emplace_back(CreateNamedPipeW(kStatusPipe, PIPE_ACCESS_OUTBOUND, PIPE_TYPE_BYTE, PIPE_UNLIMITED_INSTANCES,
                                            4096, 0, 0, nullptr));
    reportIdle(bench, 2, 3);
}

} // namespace tavi::bench
