#include "StatusServer.h"

#include <atomic>
#include <cstdlib>
#include <utility>

#include "Messages.h"
#include "Text.h"

namespace service {
namespace {

constexpr wchar_t kStatusPipe[] = L"\\\\.\\pipe\\tavistatus";
constexpr DWORD kPatience = 10000;
constexpr std::size_t kLongQueue = 20;
constexpr std::size_t kLongestQueue = 2000;

} // namespace

struct StatusServer::Client {
    explicit Client(std::unique_ptr<PipeEnd> end) : pipe(std::move(end)) {}
    std::unique_ptr<PipeEnd> pipe;
    std::deque<Outgoing> queue;
    Handle wake = makeEvent();
    std::atomic<bool> left{false};
    std::thread thread;
};

StatusServer::StatusServer()
{
    // Here, so that a client finds the pipe as soon as there is a server.
    auto first = std::make_unique<PipeEnd>(kStatusPipe, PIPE_ACCESS_OUTBOUND, stop_.get());
    acceptor_ = std::thread([this, pipe = std::move(first)]() mutable { accept(std::move(pipe)); });
}

StatusServer::~StatusServer()
{
    SetEvent(stop_.get());
    acceptor_.join();
    dropLeft(true);
}

void StatusServer::dropLeft(bool all)
{
    std::vector<std::unique_ptr<Client>> gone;
    {
        const std::lock_guard guard(mutex_);
        for (std::size_t i = clients_.size(); i-- > 0;) {
            if (all || clients_[i]->left) {
                gone.push_back(std::move(clients_[i]));
                clients_.erase(clients_.begin() + static_cast<std::ptrdiff_t>(i));
            }
        }
    }
    for (const auto& client : gone)
        client->thread.join();
}

void StatusServer::accept(std::unique_ptr<PipeEnd> next)
{
    while (next->connect() || WaitForSingleObject(stop_.get(), 10) == WAIT_TIMEOUT) {
        // The next instance first: a client that comes again at once must find one.
        auto connected = std::exchange(next, std::make_unique<PipeEnd>(kStatusPipe, PIPE_ACCESS_OUTBOUND, stop_.get()));
        dropLeft(false);
        auto client = std::make_unique<Client>(std::move(connected));
        const std::lock_guard guard(mutex_);
        client->queue.push_back({0, 0, {}, snapshotFrame(running_ ? restoreStarted : restoreEnded)});
        if (running_) {
            client->queue.push_back({restoreStarted, 0, {}, {}});
            if (total_ > 0)
                client->queue.push_back({restoreTotal, total_, {}, {}});
            if (done_ > 0)
                client->queue.push_back({bytesDone, done_, {}, {}});
            if (!item_.empty())
                client->queue.push_back({itemStarted, 0, item_, {}});
        }
        Client& kept = *clients_.emplace_back(std::move(client));
        kept.thread = std::thread([this, &kept] {
            serve(kept);
            // Not disconnected, which would take back what the client has not read yet.
            kept.pipe.reset();
            kept.left = true;
        });
        SetEvent(kept.wake.get());
    }
}

void StatusServer::serve(Client& client)
{
    const HANDLE events[] = {stop_.get(), client.wake.get()};
    while (WaitForMultipleObjects(2, events, FALSE, INFINITE) == WAIT_OBJECT_0 + 1) {
        Outgoing next;
        {
            const std::lock_guard guard(mutex_);
            if (client.queue.empty()) {
                ResetEvent(client.wake.get());
                continue;
            }
            next = std::move(client.queue.front());
            client.queue.pop_front();
        }
        const std::string bytes = next.raw.empty() ? eventFrame(next.type, next.value, next.text) : next.raw;
        for (; next.repeat > 0; --next.repeat) {
            if (!client.pipe->write(bytes, kPatience))
                return;
        }
        if (next.pause > 0 && WaitForSingleObject(stop_.get(), next.pause) != WAIT_TIMEOUT)
            return;
        if (next.hangUp)
            return;
    }
}

void StatusServer::collapse(std::deque<Outgoing>& queue)
{
    std::deque<Outgoing> shorter;
    for (Outgoing& message : queue) {
        const auto isProgress = [](const Outgoing& one) {
            return one.raw.empty() && one.type >= itemStarted && one.type <= bytesDone;
        };
        // Within a run of progress messages: one sum, and the last item.
        std::size_t run = shorter.size();
        while (isProgress(message) && run > 0 && isProgress(shorter[run - 1]))
            --run;
        std::size_t same = run;
        while (same < shorter.size() && (shorter[same].type == bytesDone) != (message.type == bytesDone))
            ++same;
        if (!isProgress(message) || same == shorter.size()) {
            shorter.push_back(std::move(message));
        } else if (message.type == bytesDone) {
            shorter[same].value += message.value;
        } else {
            shorter[same] = std::move(message);
        }
    }
    queue = std::move(shorter);
}

void StatusServer::post(const Outgoing& message)
{
    for (const auto& client : clients_) {
        if (client->left)
            continue;
        client->queue.push_back(message);
        if (client->queue.size() > kLongQueue)
            collapse(client->queue);
        if (client->queue.size() > kLongestQueue) {
            client->queue.clear();
            Outgoing end;
            end.repeat = 0;
            end.hangUp = true;
            client->queue.push_back(end);
        }
        SetEvent(client->wake.get());
    }
}

void StatusServer::send(std::uint32_t type, std::uint64_t value, const std::wstring& text)
{
    const std::lock_guard guard(mutex_);
    switch (type) {
    case restoreStarted:
    case restoreEnded:
        running_ = type == restoreStarted;
        total_ = done_ = 0;
        item_.clear();
        break;
    case restoreTotal:
        total_ = value;
        break;
    case itemStarted:
    case itemEnded:
        item_ = text;
        break;
    case bytesDone:
        done_ += value;
        break;
    default:
        break;
    }
    post({type, value, text, {}});
}

void StatusServer::sendRaw(const std::string& frame)
{
    const std::lock_guard guard(mutex_);
    post({0, 0, {}, frame});
}

const std::vector<std::wstring>& StatusServer::garbageKinds()
{
    static const std::vector<std::wstring> kinds = {L"length", L"count", L"huge",  L"short", L"type",
                                                    L"cut",    L"stall", L"flood", L"random"};
    return kinds;
}

bool StatusServer::sendGarbage(const std::wstring& kind)
{
    const std::string fields(16, '\0');
    Outgoing garbage;
    if (kind == L"length") {
        garbage.raw = header(restoreEnded, UINT32_MAX) + "abcde";
    } else if (kind == L"count") {
        garbage.raw = header(itemStarted, 25) + fields + "\xff\xff\xff\x7f" + "abcde";
    } else if (kind == L"huge") {
        // Many small parts: a client that does not read them would keep the whole in memory.
        garbage.raw = std::string(65536, 'x');
        garbage.repeat = 1024;
    } else if (kind == L"short") {
        garbage.raw = header(restoreEnded, 19) + std::string(19, '\0');
    } else if (kind == L"type") {
        garbage.raw = header(30, 20) + std::string(20, '\0');
    } else if (kind == L"cut") {
        garbage.raw = header(restoreStarted, 20).substr(0, 4);
        garbage.hangUp = true;
    } else if (kind == L"stall") {
        garbage.raw = header(restoreStarted, 20) + std::string(10, '\0');
        garbage.pause = 3000;
        garbage.hangUp = true;
    } else if (kind == L"flood") {
        garbage.raw = eventFrame(itemStarted, 0, L"C:\\flood.txt");
        garbage.repeat = 10000;
    } else if (kind == L"random") {
        for (int i = 0; i < 4096; ++i)
            garbage.raw += static_cast<char>(std::rand());
        garbage.hangUp = true;
    } else {
        return false;
    }
    const std::lock_guard guard(mutex_);
    if (kind == L"huge")
        post({0, 0, {}, header(itemStarted, 64 << 20)});
    post(garbage);
    return true;
}

} // namespace service
