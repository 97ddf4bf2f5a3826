#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// The pending messages of a window, oldest first, bounded however long the window is busy. Beyond a bound the oldest
// texts and amounts are dropped: the transfer status contains them. Starts and ends of restores and snapshots are kept.
// Each operation takes constant time. Not synchronised.
//
// At most one notification is in flight, so that the window's message queue stays short too.
class PendingMessages {
  public:
    static constexpr std::size_t kMaxCount = 1000;
    static constexpr std::size_t kMaxTextBytes = 1024 * 1024;

    // Adds the message. Returns the message to notify the window with, or null when nothing is pending or a
    // notification is in flight. The caller only compares it: it may be dropped at any time.
    const PipeMessage* put(std::unique_ptr<PipeMessage> message);
    // Returns whether this is the notification in flight; the next message then causes another one.
    bool accept(const PipeMessage* notification) noexcept;
    // Returns the oldest message, or null.
    std::unique_ptr<PipeMessage> take();
    // Destroys all messages and forgets the notification.
    void clear();

  private:
    struct Pending {
        std::uint64_t number;
        std::unique_ptr<PipeMessage> message;
    };

    std::unique_ptr<PipeMessage> takeOldest(std::deque<Pending>& queue) noexcept;
    std::unique_ptr<PipeMessage> takeCounted();
    void trim();

    std::deque<Pending> kept_;
    std::deque<Pending> droppable_;
    // The number of starts, ends and snapshots beyond the bound, which are older than all others. Only their types
    // matter to the window, not their order.
    std::map<EventType, std::uint64_t> counted_;
    std::size_t textBytes_ = 0;
    std::uint64_t nextNumber_ = 0;
    const PipeMessage* notification_ = nullptr;
};

} // namespace tavi
