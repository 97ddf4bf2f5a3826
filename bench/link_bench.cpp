#include <atomic>
#include <cstring>
#include <stdexcept>
#include <thread>

#include <windows.h>
#include <wx/datetime.h>

#include "bench/Bench.h"
#include "bench/BenchInstall.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "manifest/ManifestWatcher.h"
#include "link/MessageReader.h"
#include "link/PipeIo.h"
#include "link/StatusListener.h"

namespace tavi::bench {
namespace {

using Bytes = std::vector<unsigned char>;

// What a restore sends, over and over.
Bytes streamOf(unsigned messages)
{
    const auto path = std::make_shared<wxString>(L"C:\\Users\\Ana\\Documents\\R\u00E9sum\u00E9 of last year.txt");
    const auto none = std::make_shared<wxString>();
    Bytes stream;
    for (unsigned i = 0; i < messages; ++i) {
        constexpr std::uint32_t kTypes[] = {54, 56, 56, 55};
        const std::uint32_t type = i == 0 ? 51 : i == 1 ? 53 : kTypes[i % 4];
        const auto frame = MessageBuffer::create();
        EventMessage(type, 0, type == 53 ? 1u << 30 : 65536, 0, type == 54 ? path : none).serialise(*frame);
        stream.insert(stream.end(), frame->data(), frame->data() + frame->length());
    }
    return stream;
}

class MemorySource final : public ByteSource {
  public:
    explicit MemorySource(const Bytes& bytes) : at_(bytes.data()), end_(bytes.data() + bytes.size()) {}
    bool peek(std::uint32_t& available) override
    {
        available = static_cast<std::uint32_t>(end_ - at_);
        return available > 0;
    }
    void pause() override {}
    bool startRead(unsigned char* into, std::uint32_t size) override
    {
        std::memcpy(into, at_, size);
        at_ += size;
        return true;
    }
    bool finishRead() override
    {
        return true;
    }
    void abandonRead() override {}

  private:
    const unsigned char* at_;
    const unsigned char* const end_;
};

// A real pipe without the required pause, which would hide what everything else costs.
class HastySource final : public ByteSource {
  public:
    explicit HastySource(HANDLE pipe) : pipe_(pipe) {}
    bool peek(std::uint32_t& available) override
    {
        DWORD count = 0;
        const bool open = PeekNamedPipe(pipe_, nullptr, 0, nullptr, &count, nullptr);
        available = count;
        return open;
    }
    void pause() override {}
    bool startRead(unsigned char* into, std::uint32_t size) override
    {
        DWORD count = 0;
        return ReadFile(pipe_, into, size, &count, nullptr);
    }
    bool finishRead() override
    {
        return true;
    }
    void abandonRead() override {}

  private:
    const HANDLE pipe_;
};

// A pipe's two ends, with the stream written and waiting to be read.
class FilledPipe {
  public:
    explicit FilledPipe(const Bytes& stream)
    {
        constexpr const wchar_t* name = L"\\\\.\\pipe\\tavi-link-bench";
        server_.reset(CreateNamedPipeW(name, PIPE_ACCESS_OUTBOUND, PIPE_TYPE_BYTE, 1, 1 << 22, 0, 0, nullptr));
        client_.reset(CreateFileW(name, GENERIC_READ, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
        DWORD count = 0;
        if (!client_ || !WriteFile(server_.get(), stream.data(), static_cast<DWORD>(stream.size()), &count, nullptr))
            throw std::runtime_error("no pipe of the bench's own");
    }
    HANDLE client() const
    {
        return client_.get();
    }

  private:
    FileHandle server_;
    FileHandle client_;
};

void expectDone(unsigned read, unsigned messages)
{
    if (read != messages)
        throw std::runtime_error("messages were lost: " + std::to_string(messages - read));
}

// The calls that no reader can do without.
void bareReads(HANDLE pipe, unsigned messages, DWORD pause)
{
    unsigned char bytes[1024];
    unsigned read = 0;
    for (DWORD count = 0; read < messages; ++read) {
        if (!PeekNamedPipe(pipe, nullptr, 0, nullptr, &count, nullptr))
            break;
        if (pause > 0)
            Sleep(pause);
        if (!ReadFile(pipe, bytes, kFrameHeaderSize, &count, nullptr))
            break;
        std::uint32_t length;
        std::memcpy(&length, bytes + 4, sizeof length);
        if (!ReadFile(pipe, bytes, length, &count, nullptr))
            break;
    }
    expectDone(read, messages);
}

double milliseconds(const FILETIME& time)
{
    return (time.dwHighDateTime * 4294967296.0 + time.dwLowDateTime) / 1e4;
}

// User and kernel time of this process. The clock behind it may go in steps of 10 ms.
double processorTime()
{
    FILETIME created, ended, kernel, user;
    GetProcessTimes(GetCurrentProcess(), &created, &ended, &kernel, &user);
    return milliseconds(kernel) + milliseconds(user);
}
constexpr double kClockStep = 10;

void reportTime(Bench& bench, const std::string& name, double time, double step)
{
    const bool measurable = time >= step;
    bench.report({name + (measurable ? "" : ", below"), measurable ? time : step, kNoBound, "ms"});
}

void messageBench(Bench& bench)
{
    const StopCheck never = [] { return false; };
    const unsigned paced = bench.quick() ? 100 : 200;
    const Bytes stream = streamOf(paced);
    const auto bareCalls = [&] {
        const FilledPipe pipe(stream);
        bareReads(pipe.client(), paced, 10);
    };
    const auto readAndDispatch = [&] {
        const FilledPipe pipe(stream);
        std::unique_ptr<PipeMessage> message;
        unsigned read = 0;
        for (; read < paced && readMessage(pipe.client(), &message, never); ++read)
            dispatch(std::move(message));
        expectDone(read, paced);
    };
    const auto pacedTimes = medianSeconds(bench.quick() ? 3 : 5, {bareCalls, readAndDispatch});
    bench.report({"message from pipe to status / required calls", pacedTimes[1] / pacedTimes[0], 1.05, "x"});
    bench.report({"message from pipe to status, beyond the required calls",
                  (pacedTimes[1] - pacedTimes[0]) / paced * 1e6, kNoBound, "us"});

    // In small parts that take turns: what a call to the system costs changes from second to second.
    constexpr unsigned kPart = 250;
    const Bytes part = streamOf(kPart);
    TransferStatus status(true, [] { return static_cast<std::uint32_t>(GetTickCount()); });
    const auto readAll = [&](ByteSource& source, unsigned messages) {
        unsigned read = 0;
        for (; read < messages; ++read) {
            const auto message = readFrame(source, never);
            if (!message)
                break;
            status.apply(*message);
        }
        expectDone(read, messages);
    };
    double bareProcessor = 0, processor = 0;
    const auto bareHasty = [&] {
        const FilledPipe pipe(part);
        const double start = processorTime();
        bareReads(pipe.client(), kPart, 0);
        bareProcessor += processorTime() - start;
    };
    const auto hasty = [&] {
        const FilledPipe pipe(part);
        HastySource source(pipe.client());
        const double start = processorTime();
        readAll(source, kPart);
        processor += processorTime() - start;
    };
    const auto times = medianSeconds(bench.quick() ? 51 : 201, {bareHasty, hasty});
    bench.report({"message without the pause / required calls", times[1] / times[0], 2, "x"});
    bench.report({"the same in processor time", processor / bareProcessor, 2, "x"});
    bench.report({"message without the pause, from a pipe", times[1] / kPart * 1e6, kNoBound, "us"});

    constexpr unsigned kMany = 20000;
    const Bytes many = streamOf(kMany);
    const auto pure = medianSeconds(bench.repetitions(), {[&] {
                                        MemorySource source(many);
                                        readAll(source, kMany);
                                    }});
    bench.report({"message from memory to status", pure[0] / kMany * 1e9, kNoBound, "ns"});
}

// --- The module at rest

constexpr int kThreads = 32;
std::atomic<bool> stopAll{false};

bool stopped()
{
    return stopAll;
}

void listen()
{
    listenToStatus(stopped);
}

void bareAttempts()
{
    while (!stopped()) {
        CreateFileW(L"\\\\.\\pipe\\tavistatus", GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
        for (int i = 0; i < 100 && !stopped(); ++i)
            Sleep(50);
    }
}

void barePolling()
{
    const FileHandle pipe(CreateFileW(L"\\\\.\\pipe\\tavistatus", GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr));
    if (!pipe)
        throw std::runtime_error("no silent service");
    DWORD count = 0;
    while (!stopped() && PeekNamedPipe(pipe.get(), nullptr, 0, nullptr, &count, nullptr))
        Sleep(10);
}

// As the module has them, but any number of watchers can have a state each. With `rounds` no time passes in them, and
// so many are done.
class Services final : public WatcherServices {
  public:
    explicit Services(unsigned rounds) : inTime_(rounds == 0), left_(rounds) {}
    ManifestRef loadManifest() override
    {
        return Manifest::parse(wxString());
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        if (!inTime_)
            --left_;
        const auto time = readManifestTime();
        milliseconds = time.value_or(0);
        return time.has_value();
    }
    std::int64_t now() override
    {
        return wxDateTime::Now().GetValue().GetValue();
    }
    void sleep(std::uint32_t milliseconds) override
    {
        if (inTime_)
            Sleep(milliseconds);
    }
    bool isStopping() override
    {
        return inTime_ ? stopped() : left_ == 0;
    }
    void buildExclusions(bool) override {}

  private:
    const bool inTime_;
    unsigned left_;
};

void runWatcher(unsigned rounds)
{
    WatcherState state;
    Services services(rounds);
    runManifestWatcher(state, services);
    state.manifest.replace({});
}

void watch()
{
    runWatcher(0);
}

void readTime()
{
    HKEY key = nullptr;
    wchar_t text[64];
    DWORD size = sizeof text;
    static const wxString name = getSettingsKeyName().AfterFirst(L'\\');
    RegOpenKeyExW(HKEY_LOCAL_MACHINE, name.wc_str(), 0, KEY_READ, &key);
    RegQueryValueExW(key, L"options.manifestmtime", nullptr, nullptr, reinterpret_cast<BYTE*>(text), &size);
    RegCloseKey(key);
}

void bareWatch()
{
    while (!stopped()) {
        for (int i = 0; i < 10 && !stopped(); ++i)
            Sleep(500);
        readTime();
    }
}

struct IdleLoop {
    const char* name;
    void (*run)();
};
constexpr IdleLoop kLoops[] = {{"listen", listen},
                               {"attempts", bareAttempts},
                               {"polling", barePolling},
                               {"watch", watch},
                               {"bare-watch", bareWatch}};

// Many at once, so that the steps of the clock do not matter: processor time in all.
std::vector<double> measureIdle(const std::vector<std::string>& arguments)
{
    void (*run)() = nullptr;
    for (const IdleLoop& loop : kLoops)
        run = loop.name == arguments.at(0) ? loop.run : run;
    std::vector<std::thread> threads;
    threads.reserve(kThreads);
    for (int i = 0; i < kThreads; ++i)
        threads.emplace_back(run);
    Sleep(1000); // starting is not being at rest
    const double start = processorTime();
    Sleep(static_cast<DWORD>(std::stoul(arguments.at(1)) * 1000));
    const double spent = processorTime() - start;
    stopAll = true;
    for (std::thread& thread : threads)
        thread.join();
    return {spent};
}
const Child idleChild("idle", measureIdle);

// The figures of several loops over the same time, each in a process of its own.
std::vector<double> idleTimes(Bench& bench, const std::vector<std::string>& loops)
{
    const std::string seconds = bench.quick() ? "5" : "60";
    std::vector<double> times(loops.size());
    std::vector<std::thread> threads;
    threads.reserve(loops.size());
    for (std::size_t i = 0; i < loops.size(); ++i)
        threads.emplace_back([&, i] {
            try {
                times[i] = bench.inOwnProcess("idle", {loops[i], seconds})[0];
            } catch (const std::exception&) {
                times[i] = -1;
            }
        });
    for (std::thread& thread : threads)
        thread.join();
    for (double& time : times) {
        if (time < 0)
            throw std::runtime_error("a loop at rest failed");
        time *= 60 / std::stod(seconds) / kThreads;
    }
    return times;
}

void reportIdle(Bench& bench, const std::string& name, double ours, double bare)
{
    const double step = kClockStep * (bench.quick() ? 12 : 1) / kThreads;
    reportTime(bench, name + ", a minute", ours, step);
    reportTime(bench, name + ", a minute of the required calls", bare, step);
    if (ours >= 10 * step && bare >= 10 * step)
        bench.report({name + " / required calls", ours / bare, 1.5, "x"});
}

void idleBench(Bench& bench)
{
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2020-01-02 03:04:05");
    const auto alone = idleTimes(bench, {"listen", "attempts", "watch", "bare-watch"});
    reportIdle(bench, "listener without a service", alone[0], alone[1]);
    reportIdle(bench, "watcher", alone[2], alone[3]);

    std::vector<FileHandle> service;
    service.reserve(2 * kThreads);
    for (int i = 0; i < 2 * kThreads; ++i)
        service.emplace_back(CreateNamedPipeW(L"\\\\.\\pipe\\tavistatus", PIPE_ACCESS_OUTBOUND, PIPE_TYPE_BYTE,
                                              PIPE_UNLIMITED_INSTANCES, 4096, 0, 0, nullptr));
    const auto connected = idleTimes(bench, {"listen", "polling"});
    reportIdle(bench, "listener of a silent service", connected[0], connected[1]);

    const unsigned rounds = bench.quick() ? 1000 : 5000;
    const auto bareRound = [&] {
        for (unsigned i = 0; i < rounds; ++i)
            readTime();
    };
    const auto times = medianSeconds(bench.repetitions(), {bareRound, [&] { runWatcher(rounds); }});
    if (!readManifestTime())
        throw std::runtime_error("the time of the manifest was not read");
    settings.DeleteValue(L"options.manifestmtime");
    bench.report({"work of a watcher's round / one registry read", times[1] / times[0], kNoBound, "x"});
    bench.report({"work of a watcher's round", times[1] / rounds * 1e6, kNoBound, "us"});
}

void linkBench(Bench& bench)
{
    messageBench(bench);
    idleBench(bench);
}
const Group linkGroup("link", linkBench);

} // namespace
} // namespace tavi::bench
