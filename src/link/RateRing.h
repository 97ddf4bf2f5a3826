#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

namespace tavi {

// Returns milliseconds since any start; wraps at 32 bits.
using TickSource = std::uint32_t (*)();

// The newest amounts of a transfer and the times between them, for rates over the last seconds. Lock-free; any thread.
// A rate may miss a sample or a clear of the same moment, but counts nothing from before a clear that it sees, and no
// sample before both its numbers are stored. Only the constructor allocates.
class RateRing {
  public:
    // The capacity is a power of two, so that one bit of a sample's number tells a lap, one pass over all slots, from
    // the next.
    RateRing(std::uint32_t capacity, TickSource clock);
    RateRing(const RateRing&) = delete;
    RateRing& operator=(const RateRing&) = delete;

    void addSample(std::uint64_t amount) noexcept;
    void clearRing() noexcept;
    // Returns bytes per millisecond over at least the newest `span` milliseconds, or over all samples.
    double rateOver(std::int32_t span) const noexcept;

  private:
    struct Step {
        std::uint32_t number;
        std::uint32_t elapsed;
    };
    // Adds to the number of the next sample and sets the time of the last one. Returns the number before, and the
    // milliseconds since the time before.
    Step advance(std::uint32_t samples) noexcept;
    // Returns the bit that distinguishes a sample from the one of the lap before in the same slot.
    std::uint32_t lapBit(std::uint32_t number) const noexcept;

    std::unique_ptr<std::atomic<std::uint64_t>[]> samples_;
    // The milliseconds between the previous sample and each sample, and the sample's lap bit.
    std::unique_ptr<std::atomic<std::uint32_t>[]> elapsed_;
    const std::uint32_t capacity_;
    // The number of the next sample, and the time of the last one or of a later clear. One word holds both, so that
    // each sample falls before or after a clear together with its time.
    std::atomic<std::uint64_t> head_;
    static_assert(std::atomic<std::uint64_t>::is_always_lock_free, "no thread must wait");
    // The number of the first sample since the last clear.
    std::atomic<std::uint32_t> first_;
    const TickSource clock_;
};

} // namespace tavi
