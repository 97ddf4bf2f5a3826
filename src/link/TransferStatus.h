#pragma once

#include <atomic>
#include <cstdint>
#include <optional>

#include <wx/string.h>

#include "core/PublishedPointer.h"
#include "link/PipeMessage.h"
#include "link/RateRing.h"

namespace tavi {

// A text that one thread replaces and any thread reads: the old one or the new one, whole, without waiting.
class PublishedText {
  public:
    void set(const wxString& text);
    void clear()
    {
        text_.replace({});
    }
    wxString get() const;

  private:
    struct Shared : RefCounted<Shared> {
        explicit Shared(const wxString& newText) : text(newText) {}
        const wxString text;
    };

    mutable PublishedPointer<Shared> text_;
};

// The picture of the running transfer. apply() is called by one thread, the status listener; every other member may be
// used by any thread at any time and none waits. Values that belong together may be one message apart.
struct TransferStatus {
    // Without `sampling` nothing is added to the rings by messages.
    TransferStatus(bool samplingOn, TickSource clock);

    void apply(const PipeMessage& message);
    void resetBackup();
    void resetRestore();

    // A quarter of a second has passed: time goes on in the rings, and rates are renewed every second and every ten.
    void timerTick() noexcept;
    // Seconds until the restore is done, or nothing when that cannot be told.
    std::optional<std::uint32_t> remainingSeconds() const noexcept;
    // Place of the progress bar, 0 to kBarRange as long as the service's numbers make sense.
    std::int32_t barPosition() const noexcept;
    static constexpr std::int32_t kBarRange = 250;
    // Bits per second.
    std::uint64_t restoreSpeed() const noexcept;

    PublishedText statusTextA;
    PublishedText statusTextB;
    PublishedText restoreText;
    RateRing ringA;
    RateRing ringB;
    RateRing restoreRing;
    // These two and rate2 are only ever reset.
    std::atomic<float> rate0{0};
    std::atomic<float> rate1{0};
    std::atomic<float> restoreRateShort{0};
    std::atomic<float> rate2{0};
    std::atomic<float> restoreRateLong{0};
    std::atomic<std::int64_t> totalA{0};
    std::atomic<std::int64_t> totalB{0};
    std::atomic<std::int64_t> restoreTotal{0};
    std::atomic<std::int64_t> doneA{0};
    std::atomic<std::int64_t> doneB{0};
    std::atomic<std::int64_t> restoreDone{0};
    std::atomic<bool> ended{false};
    std::atomic<bool> restoreStarted{false};
    std::atomic<bool> ended3{false};
    std::atomic<bool> switch34{false};
    std::atomic<bool> switch32{false};
    std::atomic<bool> switch39{false};
    std::atomic<bool> switch24{false};
    std::atomic<bool> mark10{false};
    std::atomic<bool> ended10{false};
    std::atomic<bool> ended4{false};
    std::atomic<bool> ended6{false};
    std::atomic<bool> ended8{false};
    std::atomic<bool> ended5{false};
    std::atomic<bool> ended9{false};
    const bool sampling;

  private:
    void applyEvent(const EventMessage& event);
    void applySnapshot(const SnapshotMessage& snapshot);
    // The flag that tells how a backup has ended; null for codes that have none.
    std::atomic<bool>* outcomeOf(std::uint32_t code) noexcept;
    void endWith(std::atomic<bool>* outcome) noexcept;
    void renewRate(std::atomic<float>& rate, std::int32_t span) noexcept;

    std::atomic<std::uint32_t> ticks_{0};
};

} // namespace tavi
