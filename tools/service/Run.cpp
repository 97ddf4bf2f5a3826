#include "Run.h"

#include <cwchar>
#include <mutex>
#include <optional>

#include "Commands.h"
#include "Messages.h"
#include "Restorer.h"
#include "StatusServer.h"
#include "Text.h"

namespace service {
namespace {

constexpr wchar_t kControlPipe[] = L"\\\\.\\pipe\\taviservice-control";
constexpr DWORD kControlPatience = 2000;

HANDLE theEnd = nullptr;

BOOL WINAPI endOnSignal(DWORD)
{
    SetEvent(theEnd);
    return TRUE;
}

std::int64_t number(const std::wstring& text)
{
    wchar_t* end = nullptr;
    const std::int64_t value = std::wcstoll(text.c_str(), &end, 10);
    if (text.empty() || *end || value < 0)
        throw Failure{L"not a number: " + text};
    return value;
}

// What goes at a restart and comes again.
struct Session {
    Session(const Installation& installation, const RunSettings& settings)
        : restorer(installation, settings, status), commands([this] { return restorer.cancel(); })
    {
    }
    StatusServer status;
    Restorer restorer;
    CommandServer commands;
};

class Service {
  public:
    explicit Service(const Installation& installation) : installation_(installation) {}

    void work();
    std::wstring obey(const std::vector<std::wstring>& words);

    RunSettings settings;

  private:
    void takeOrders(PipeEnd& pipe);
    std::wstring beHostile(std::int64_t seconds);
    std::wstring waitIdle(std::int64_t seconds);

    const Installation installation_;
    Handle end_ = makeEvent();
    Handle restart_ = makeEvent();
    DWORD away_ = 0;
    std::mutex mutex_;
    std::optional<Session> session_;
};

using Words = std::vector<std::wstring>;

// How an order reads; the word count includes the order itself.
const struct {
    const wchar_t* name;
    const wchar_t* arguments;
    std::size_t fewest;
    std::size_t most;
} kOrders[] = {{L"rate", L"BYTES_PER_SECOND", 2, 2},
               {L"stop", L"", 1, 1},
               {L"kill", L"", 1, 1},
               {L"restart", L"MILLISECONDS", 2, 2},
               {L"send", L"TYPE [VALUE [TEXT]]", 2, 4},
               {L"snapshot", L"STATE", 2, 2},
               {L"garbage", L"KIND", 2, 2},
               {L"hostile", L"SECONDS", 2, 2},
               {L"wait-idle", L"SECONDS", 2, 2}};

std::wstring Service::beHostile(std::int64_t seconds)
{
    const DWORD start = GetTickCount();
    std::size_t rounds = 0;
    const auto& kinds = StatusServer::garbageKinds();
    while (GetTickCount() - start < static_cast<DWORD>(seconds) * 1000 &&
           WaitForSingleObject(end_.get(), 100) == WAIT_TIMEOUT) {
        const std::lock_guard guard(mutex_);
        if (session_)
            session_->status.sendGarbage(kinds[rounds++ % kinds.size()]);
    }
    return std::to_wstring(rounds) + L" times";
}

std::wstring Service::waitIdle(std::int64_t seconds)
{
    const DWORD start = GetTickCount();
    while (GetTickCount() - start < static_cast<DWORD>(seconds) * 1000) {
        {
            const std::lock_guard guard(mutex_);
            if (session_ && session_->restorer.isIdle())
                return L"idle";
        }
        if (WaitForSingleObject(theEnd, 50) != WAIT_TIMEOUT)
            break;
    }
    throw Failure{L"still at work"};
}

std::wstring Service::obey(const Words& words)
{
    const std::wstring& order = words[0];
    if (order == L"wait-idle")
        return waitIdle(number(words[1]));
    if (order == L"hostile")
        return beHostile(number(words[1]));
    if (order == L"rate") {
        settings.rate = number(words[1]);
        return L"done";
    }
    // The two that end the service do so after their answer.
    if (order == L"stop" || order == L"kill")
        return L"done";
    if (order == L"restart") {
        away_ = static_cast<DWORD>(number(words[1]));
        SetEvent(restart_.get());
        return L"restarting";
    }
    const std::lock_guard guard(mutex_);
    if (!session_)
        throw Failure{L"not open at present"};
    if (order == L"send")
        session_->status.send(static_cast<std::uint32_t>(number(words[1])),
                              words.size() > 2 ? static_cast<std::uint64_t>(number(words[2])) : 0,
                              words.size() > 3 ? words[3] : std::wstring());
    else if (order == L"snapshot")
        session_->status.sendRaw(snapshotFrame(static_cast<std::uint32_t>(number(words[1]))));
    else if (order == L"garbage" && !session_->status.sendGarbage(words[1]))
        throw Failure{L"no such garbage: " + words[1]};
    return L"done";
}

// An order is words with a tab between, an answer a digit for refused (1) or done (0) and a text.
void Service::takeOrders(PipeEnd& pipe)
{
    while (pipe.connect() || WaitForSingleObject(end_.get(), 10) == WAIT_TIMEOUT) {
        std::string line, part;
        while (line.find('\n') == std::string::npos && pipe.read(part, 4096, kControlPatience))
            line += part;
        Words words(1);
        for (const wchar_t letter : fromUtf8(line.substr(0, line.find('\n')))) {
            if (letter == L'\t')
                words.emplace_back();
            else
                words.back() += letter;
        }
        std::wstring answer = L"1not an order; see --help";
        for (const auto& known : kOrders) {
            if (words[0] != known.name || words.size() < known.fewest || words.size() > known.most)
                continue;
            try {
                answer = L"0" + obey(words);
            } catch (const Failure& failure) {
                answer = L"1" + failure.text;
            } catch (const std::exception& error) {
                answer = L"1" + fromUtf8(error.what());
            }
        }
        pipe.write(toUtf8(answer + L"\n"), kControlPatience);
        const bool accepted = answer[0] == L'0';
        if (accepted && words[0] == L"kill")
            TerminateProcess(GetCurrentProcess(), 1);
        // The client hangs up once it has the answer.
        pipe.read(part, 1, kControlPatience);
        if (accepted && words[0] == L"stop")
            SetEvent(theEnd);
        pipe.disconnect();
    }
}

void Service::work()
{
    // The only instance: a second service cannot make it, and ends.
    PipeEnd control(kControlPipe, PIPE_ACCESS_DUPLEX, end_.get(), 1);
    {
        const std::lock_guard guard(mutex_);
        session_.emplace(installation_, settings);
    }
    std::thread orders([this, &control] { takeOrders(control); });
    const HANDLE events[] = {theEnd, restart_.get()};
    DWORD woken = WAIT_OBJECT_0 + 1;
    while (woken == WAIT_OBJECT_0 + 1) {
        print(L"ready\n");
        woken = WaitForMultipleObjects(2, events, FALSE, INFINITE);
        {
            const std::lock_guard guard(mutex_);
            session_.reset();
        }
        ResetEvent(restart_.get());
        if (woken == WAIT_OBJECT_0 + 1 && WaitForSingleObject(theEnd, away_) == WAIT_TIMEOUT) {
            const std::lock_guard guard(mutex_);
            session_.emplace(installation_, settings);
        }
    }
    SetEvent(end_.get());
    orders.join();
    print(L"stopped\n");
}

} // namespace

int run(const std::vector<std::wstring>& arguments)
{
    Service service(findInstallation());
    for (std::size_t at = 0; at < arguments.size(); at += 2) {
        const std::int64_t value = number(at + 1 < arguments.size() ? arguments[at + 1] : L"");
        if (arguments[at] == L"--rate")
            service.settings.rate = value;
        else if (arguments[at] == L"--search")
            service.settings.search = static_cast<DWORD>(value);
        else if (arguments[at] == L"--poll")
            service.settings.poll = static_cast<DWORD>(value);
        else
            throw Failure{L"no such option: " + arguments[at]};
    }
    const Handle end = makeEvent();
    theEnd = end.get();
    SetConsoleCtrlHandler(endOnSignal, TRUE);
    service.work();
    return 0;
}

bool tell(const std::vector<std::wstring>& words)
{
    std::wstring line;
    for (const std::wstring& word : words)
        line += (line.empty() ? L"" : L"\t") + word;
    if (!WaitNamedPipeW(kControlPipe, kControlPatience))
        throw Failure{L"the service is not at work"};
    const HANDLE file = CreateFileW(kControlPipe, GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE)
        throw systemFailure(L"the service cannot be told", GetLastError());
    const Handle pipe(file);
    const std::string bytes = toUtf8(line + L"\n");
    DWORD count = 0;
    if (!WriteFile(file, bytes.data(), static_cast<DWORD>(bytes.size()), &count, nullptr))
        throw systemFailure(L"the service cannot be told", GetLastError());
    std::string answer;
    char part[512];
    while (answer.find('\n') == std::string::npos && ReadFile(file, part, sizeof part, &count, nullptr) && count > 0)
        answer.append(part, count);
    if (answer.empty())
        throw Failure{L"the service gave no answer"};
    print(fromUtf8(answer.substr(1)));
    return answer[0] == '0';
}

std::wstring ordersHelp()
{
    std::wstring text = L"orders of tell:\n";
    for (const auto& order : kOrders)
        text += std::wstring(L"  ") + order.name + L" " + order.arguments + L"\n";
    text += L"  kinds of garbage:";
    for (const std::wstring& kind : StatusServer::garbageKinds())
        text += L" " + kind;
    return text + L"\n";
}

} // namespace service
