#include "link/RateRing.h"

namespace tavi {
namespace {

constexpr std::uint32_t kLapBit = 1u << 31;

std::uint64_t pack(std::uint32_t next, std::uint32_t tick) noexcept
{
    return std::uint64_t{next} << 32 | tick;
}

std::uint32_t nextOf(std::uint64_t head) noexcept
{
    return static_cast<std::uint32_t>(head >> 32);
}

} // namespace

// The numbers start in a lap whose bit the empty slots do not have.
RateRing::RateRing(std::uint32_t capacity, TickSource clock)
    : samples_(new std::atomic<std::uint64_t>[capacity]()), elapsed_(new std::atomic<std::uint32_t>[capacity]()),
      capacity_(capacity), head_(pack(capacity, clock())), first_(capacity), clock_(clock)
{
}

RateRing::Step RateRing::advance(std::uint32_t samples) noexcept
{
    std::uint64_t head = head_;
    while (true) {
        // The clock is read again after each failed exchange, so that the time never decreases.
        const std::uint32_t now = clock_();
        const Step step{nextOf(head), now - static_cast<std::uint32_t>(head)};
        if (head_.compare_exchange_weak(head, pack(step.number + samples, now)))
            return step;
    }
}

std::uint32_t RateRing::lapBit(std::uint32_t number) const noexcept
{
    return number & capacity_ ? kLapBit : 0;
}

void RateRing::addSample(std::uint64_t amount) noexcept
{
    const Step step = advance(1);
    const std::uint32_t slot = step.number % capacity_;
    samples_[slot] = amount;
    // Last, since the lap bit publishes the sample.
    elapsed_[slot] = (step.elapsed & ~kLapBit) | lapBit(step.number);
}

void RateRing::clearRing() noexcept
{
    first_ = advance(0).number;
}

double RateRing::rateOver(std::int32_t span) const noexcept
{
    const std::uint32_t first = first_;
    const std::uint32_t end = nextOf(head_);
    std::uint32_t milliseconds = 0;
    std::uint64_t bytes = 0;
    for (std::uint32_t i = end;
         static_cast<std::int32_t>(milliseconds) < span && i != first && end - i < capacity_ - 1;) {
        --i;
        const std::uint32_t elapsed = elapsed_[i % capacity_];
        const std::uint64_t amount = samples_[i % capacity_];
        // This slot and all older ones may hold newer samples by now.
        if (nextOf(head_) - i > capacity_)
            break;
        // Claimed, but not stored yet.
        if ((elapsed & kLapBit) != lapBit(i))
            continue;
        milliseconds += elapsed & ~kLapBit;
        bytes += amount;
    }
    const auto sum = static_cast<std::int32_t>(milliseconds);
    return sum == 0 ? 0 : static_cast<double>(static_cast<std::int64_t>(bytes)) / sum;
}

} // namespace tavi
