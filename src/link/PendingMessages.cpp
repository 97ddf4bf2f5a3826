#include "link/PendingMessages.h"

#include <utility>

namespace tavi {
namespace {

bool isKept(const PipeMessage& message) noexcept
{
    const EventType type = message.type();
    return type == EventType::snapshot || type == EventType::restoreStarted || type == EventType::restoreEnded;
}

std::size_t textBytes(const PipeMessage& message) noexcept
{
    const auto bytes = [](const MessageText& text) { return text->length() * sizeof(wchar_t); };
    switch (message.kind()) {
    case MessageKind::event:
        return bytes(static_cast<const EventMessage&>(message).text);
    case MessageKind::item:
        return bytes(static_cast<const ItemMessage&>(message).text);
    case MessageKind::textTriple: {
        const auto& triple = static_cast<const TextTripleMessage&>(message);
        return bytes(triple.text1) + bytes(triple.text2) + bytes(triple.text3);
    }
    default:
        return 0;
    }
}

} // namespace

const PipeMessage* PendingMessages::put(std::unique_ptr<PipeMessage> message)
{
    const bool kept = isKept(*message);
    const std::size_t bytes = textBytes(*message);
    // A start or an end needs no text, and the bound on texts could not drop it.
    if (kept && bytes > 0)
        message = std::make_unique<EventMessage>(message->type());
    const PipeMessage* const added = message.get();
    (kept ? kept_ : droppable_).push_back({nextNumber_++, std::move(message)});
    if (!kept)
        textBytes_ += bytes;
    trim();
    const bool isPending = !kept_.empty() || !droppable_.empty();
    return isPending && !notification_ ? notification_ = added : nullptr;
}

bool PendingMessages::accept(const PipeMessage* notification) noexcept
{
    if (!notification || notification != notification_)
        return false;
    notification_ = nullptr;
    return true;
}

std::unique_ptr<PipeMessage> PendingMessages::take()
{
    if (!counted_.empty())
        return takeCounted();
    if (!kept_.empty() && (droppable_.empty() || kept_.front().number < droppable_.front().number))
        return takeOldest(kept_);
    return droppable_.empty() ? nullptr : takeOldest(droppable_);
}

void PendingMessages::clear()
{
    *this = PendingMessages();
}

std::unique_ptr<PipeMessage> PendingMessages::takeOldest(std::deque<Pending>& queue) noexcept
{
    auto message = std::move(queue.front().message);
    queue.pop_front();
    if (&queue == &droppable_)
        textBytes_ -= textBytes(*message);
    return message;
}

std::unique_ptr<PipeMessage> PendingMessages::takeCounted()
{
    const auto counted = counted_.begin();
    std::unique_ptr<PipeMessage> message;
    if (counted->first == EventType::snapshot)
        message = std::make_unique<SnapshotMessage>(0, 0, 0, 0, 0);
    else
        message = std::make_unique<EventMessage>(counted->first);
    if (--counted->second == 0)
        counted_.erase(counted);
    return message;
}

void PendingMessages::trim()
{
    while (!droppable_.empty() && (kept_.size() + droppable_.size() > kMaxCount || textBytes_ > kMaxTextBytes))
        takeOldest(droppable_);
    for (; kept_.size() > kMaxCount; kept_.pop_front())
        ++counted_[kept_.front().message->type()];
}

} // namespace tavi
