#include "StatusServer.h"

#include <algorithm>
#include <cstdlib>
#include <utility>

#include "common/Text.h"
#include "Messages.h"

namespace service {
namespace {

constexpr wchar_t kStatusPipe[] = L"\\\\.\\pipe\\tavistatus";
constexpr DWORD kWriteMs = 10000;
constexpr std::size_t kMaxQueuedOutputs = 2000;

} // namespace

struct StatusServer::Client {
    std::unique_ptr<PipeEnd> pipe;
    std::deque<Output> queue;
    tools::Handle wake = tools::createEvent();
    bool gone = false;
    std::thread thread;
};

StatusServer::StatusServer()
{
    // Created here, so that a client finds the pipe as soon as there is a server.
    next_ = createPipe();
    acceptor_ = std::thread([this] { accept(); });
}

StatusServer::~StatusServer()
{
    SetEvent(stop_.get());
    acceptor_.join();
    for (const auto& client : clients_)
        client->thread.join();
}

std::unique_ptr<PipeEnd> StatusServer::createPipe() const
{
    return std::make_unique<PipeEnd>(kStatusPipe, PIPE_ACCESS_OUTBOUND, stop_.get());
}

void StatusServer::accept()
{
    while (next_->connect()) {
        auto client = std::make_unique<Client>();
        // The next instance exists before the client is served: one that reconnects at once must find it.
        client->pipe = std::exchange(next_, createPipe());
        const std::lock_guard guard(mutex_);
        dropGone();
        sendStateTo(*client);
        client->thread = std::thread([this, &served = *client] { serve(served); });
        clients_.push_back(std::move(client));
    }
}

// The lock is held. A thread takes it for the last time before it sets `gone`.
void StatusServer::dropGone()
{
    const auto first =
        std::partition(clients_.begin(), clients_.end(), [](const auto& client) { return !client->gone; });
    std::for_each(first, clients_.end(), [](const auto& client) { client->thread.join(); });
    clients_.erase(first, clients_.end());
}

void StatusServer::sendStateTo(Client& client) const
{
    client.queue.push_back({snapshotFrame(running_ ? kRestoreStarted : kRestoreEnded)});
    if (running_) {
        client.queue.push_back({eventFrame(kRestoreStarted)});
        if (total_ > 0)
            client.queue.push_back({eventFrame(kRestoreTotal, total_)});
        if (done_ > 0)
            client.queue.push_back({eventFrame(kBytesDone, done_)});
        if (!item_.empty())
            client.queue.push_back({eventFrame(kItemStarted, 0, item_)});
    }
    SetEvent(client.wake.get());
}

void StatusServer::serve(Client& client)
{
    const HANDLE events[] = {stop_.get(), client.wake.get()};
    bool connected = true;
    while (connected && WaitForMultipleObjects(2, events, FALSE, INFINITE) == WAIT_OBJECT_0 + 1) {
        Output next;
        {
            const std::lock_guard guard(mutex_);
            if (client.queue.empty()) {
                ResetEvent(client.wake.get());
                continue;
            }
            next = std::move(client.queue.front());
            client.queue.pop_front();
        }
        for (; connected && next.repeat > 0; --next.repeat)
            connected = client.pipe->write(next.bytes, kWriteMs);
        WaitForSingleObject(stop_.get(), next.pauseMs);
        connected = connected && !next.hangUp;
    }
    // A disconnect would take back what the client has not read yet.
    client.pipe.reset();
    const std::lock_guard guard(mutex_);
    client.gone = true;
}

void StatusServer::post(const Output& output)
{
    for (const auto& client : clients_) {
        client->queue.push_back(output);
        if (client->queue.size() > kMaxQueuedOutputs)
            client->queue = {{"", 0, 0, true}};
        SetEvent(client->wake.get());
    }
}

void StatusServer::send(std::uint32_t type, std::uint64_t value, const std::wstring& text)
{
    const std::lock_guard guard(mutex_);
    switch (type) {
    case kRestoreStarted:
    case kRestoreEnded:
        running_ = type == kRestoreStarted;
        total_ = done_ = 0;
        item_.clear();
        break;
    case kRestoreTotal:
        total_ = value;
        break;
    case kItemStarted:
    case kItemEnded:
        item_ = text;
        break;
    case kBytesDone:
        done_ += value;
        break;
    default:
        break;
    }
    post({eventFrame(type, value, text)});
}

std::vector<StatusServer::Garbage> StatusServer::garbage()
{
    const std::string fields(16, '\0');
    std::string noise(4096, '\0');
    std::generate(noise.begin(), noise.end(), [] { return static_cast<char>(std::rand()); });
    return {
        {L"length", {{header(kRestoreEnded, UINT32_MAX) + "abcde"}}},
        {L"count", {{header(kItemStarted, 25) + fields + "\xff\xff\xff\x7f" + "abcde"}}},
        // Many small parts: a client that does not read them would keep the whole in memory.
        {L"huge", {{header(kItemStarted, 64 << 20)}, {std::string(65536, 'x'), 1024}}},
        {L"short", {{header(kRestoreEnded, 19) + std::string(19, '\0')}}},
        {L"type", {{header(30, 20) + std::string(20, '\0')}}},
        {L"cut", {{header(kRestoreStarted, 20).substr(0, 4), 1, 0, true}}},
        {L"stall", {{header(kRestoreStarted, 20) + std::string(10, '\0'), 1, 3000, true}}},
        {L"flood", {{eventFrame(kItemStarted, 0, L"C:\\flood.txt"), 10000}}},
        {L"random", {{noise, 1, 0, true}}},
        // A restore that no request asked for.
        {L"snapshot", {{snapshotFrame(kRestoreStarted)}}},
    };
}

void StatusServer::sendGarbage(const std::wstring& kind)
{
    const std::vector<Garbage> all = garbage();
    const auto found = std::find_if(all.begin(), all.end(), [&](const Garbage& one) { return one.kind == kind; });
    if (found == all.end())
        throw tools::Failure{L"no such garbage: " + kind};
    const std::lock_guard guard(mutex_);
    for (const Output& output : found->outputs)
        post(output);
}

void StatusServer::sendNextGarbage()
{
    const std::vector<Garbage> all = garbage();
    sendGarbage(all[garbageSent_++ % all.size()].kind);
}

} // namespace service
