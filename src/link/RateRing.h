#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

namespace tavi {

// Milliseconds since some start, wrapping at 32 bits.
using TickSource = std::uint32_t (*)();

// The newest amounts of a transfer with the time between them, for rates over the last seconds. Lock-free for any
// number of threads: a sample added or a clear done while a rate is summed may or may not be in it. Allocates only when
// made.
class RateRing {
  public:
    RateRing(std::int32_t capacity, TickSource clock);
    RateRing(const RateRing&) = delete;
    RateRing& operator=(const RateRing&) = delete;

    void addSample(std::uint64_t amount) noexcept;
    void clearRing() noexcept;
    // Bytes per millisecond over at least the newest `span` milliseconds, or all there is.
    double rateOver(std::int32_t span) const noexcept;

  private:
    std::unique_ptr<std::atomic<std::uint64_t>[]> samples_;
    // Milliseconds from the sample before to this one.
    std::unique_ptr<std::atomic<std::uint32_t>[]> elapsed_;
    const std::int32_t capacity_;
    std::atomic<std::int32_t> next_{0};
    std::atomic<std::uint32_t> lastTick_;
    const TickSource clock_;
};

} // namespace tavi
