#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

namespace tavi {

// Returns milliseconds since any start; wraps at 32 bits.
using TickSource = std::uint32_t (*)();

// The newest amounts of a transfer and the times between them, for rates over the last seconds. Lock-free; any thread.
// A rate may miss a sample or a clear of the same moment. Only the constructor allocates.
class RateRing {
  public:
    RateRing(std::int32_t capacity, TickSource clock);
    RateRing(const RateRing&) = delete;
    RateRing& operator=(const RateRing&) = delete;

    void addSample(std::uint64_t amount) noexcept;
    void clearRing() noexcept;
    // Returns bytes per millisecond over at least the newest `span` milliseconds, or over all samples.
    double rateOver(std::int32_t span) const noexcept;

  private:
    std::unique_ptr<std::atomic<std::uint64_t>[]> samples_;
    // The milliseconds between the previous sample and each sample.
    std::unique_ptr<std::atomic<std::uint32_t>[]> elapsed_;
    const std::int32_t capacity_;
    std::atomic<std::int32_t> next_{0};
    std::atomic<std::uint32_t> lastTick_;
    const TickSource clock_;
};

} // namespace tavi
