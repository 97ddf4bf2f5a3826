#include "link/RateRing.h"

namespace tavi {

RateRing::RateRing(std::int32_t capacity, TickSource clock)
    : samples_(new std::atomic<std::uint64_t>[static_cast<std::size_t>(capacity)]()),
      elapsed_(new std::atomic<std::uint32_t>[static_cast<std::size_t>(capacity)]()), capacity_(capacity),
      lastTick_(clock()), clock_(clock)
{
}

void RateRing::addSample(std::uint64_t amount) noexcept
{
    // The clock is read again after each failed exchange, so that the last tick never decreases.
    std::uint32_t last = lastTick_.load(std::memory_order_relaxed);
    std::uint32_t now = clock_();
    while (!lastTick_.compare_exchange_weak(last, now, std::memory_order_relaxed))
        now = clock_();
    std::int32_t slot = next_.load(std::memory_order_relaxed);
    while (!next_.compare_exchange_weak(slot, (slot + 1) % capacity_, std::memory_order_relaxed)) {
    }
    samples_[static_cast<std::size_t>(slot)].store(amount, std::memory_order_relaxed);
    elapsed_[static_cast<std::size_t>(slot)].store(now - last, std::memory_order_relaxed);
}

void RateRing::clearRing() noexcept
{
    for (std::size_t i = 0; i < static_cast<std::size_t>(capacity_); ++i) {
        samples_[i].store(0, std::memory_order_relaxed);
        elapsed_[i].store(0, std::memory_order_relaxed);
    }
    next_.store(0, std::memory_order_relaxed);
    lastTick_.store(clock_(), std::memory_order_relaxed);
}

double RateRing::rateOver(std::int32_t span) const noexcept
{
    if (span <= 0)
        return 0;
    const std::int32_t end = next_.load(std::memory_order_relaxed);
    std::uint32_t milliseconds = 0;
    std::uint64_t bytes = 0;
    std::int32_t slot = (capacity_ + end - 1) % capacity_;
    // In a ring that has not wrapped yet the oldest slots are 0.
    while (static_cast<std::int32_t>(milliseconds) < span && slot != end) {
        milliseconds += elapsed_[static_cast<std::size_t>(slot)].load(std::memory_order_relaxed);
        bytes += samples_[static_cast<std::size_t>(slot)].load(std::memory_order_relaxed);
        slot = (capacity_ + slot - 1) % capacity_;
    }
    const auto sum = static_cast<std::int32_t>(milliseconds);
    return sum == 0 ? 0 : static_cast<double>(static_cast<std::int64_t>(bytes)) / sum;
}

} // namespace tavi
