#pragma once

#include <atomic>
#include <cstdint>
#include <optional>

#include <wx/string.h>

#include "core/PublishedPointer.h"
#include "link/PipeMessage.h"
#include "link/RateRing.h"

namespace tavi {

// A text that one thread replaces. Any thread reads the old or the new one, whole, without waiting. A text longer than
// any path is cut, so that a peer cannot make the window copy and lay out more.
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

// The state of the running backup and restore. Only the status listener's thread calls apply(); any thread may use
// every other member at any time, and none waits. Values that belong together may be one message apart.
struct TransferStatus {
    // Without `samplingOn` messages add nothing to the rings.
    TransferStatus(bool samplingOn, TickSource clock);

    void apply(const PipeMessage& message);
    void resetBackup();
    void resetRestore();

    // To be called every 250 ms: advances the rings' time, and computes the short rate every second and the long rate
    // every ten seconds.
    void timerTick() noexcept;
    // Returns the seconds until the restore is done, or nothing if no estimate is possible.
    std::optional<std::uint32_t> remainingSeconds() const noexcept;
    // Returns the position of the progress bar: 0 to kBarRange unless the service's numbers are absurd.
    std::int32_t barPosition() const noexcept;
    static constexpr std::int32_t kBarRange = 250;
    // Returns the short rate in whole bits per second.
    std::uint64_t restoreSpeed() const noexcept;

    // The restore, as the progress window shows it: the current item, the amounts of the last minutes, bits per second
    // over 5 and 60 seconds, bytes to restore and restored, and whether one runs.
    PublishedText restoreText;
    RateRing restoreRing;
    std::atomic<float> restoreRateShort{0};
    std::atomic<float> restoreRateLong{0};
    std::atomic<std::int64_t> restoreTotal{0};
    std::atomic<std::int64_t> restoreDone{0};
    std::atomic<bool> restoreStarted{false};

    // The backup, for others (see ARCHITECTURE.md). Its two texts.
    PublishedText statusTextA;
    PublishedText statusTextB;
    // The newest amounts of A, and those of B whose message says that they count.
    RateRing ringA;
    RateRing ringB;
    // Rates that nothing computes; every reset sets them to 0.
    std::atomic<float> rate0{0};
    std::atomic<float> rate1{0};
    std::atomic<float> rate2{0};
    // The amounts expected and done.
    std::atomic<std::int64_t> totalA{0};
    std::atomic<std::int64_t> totalB{0};
    std::atomic<std::int64_t> doneA{0};
    std::atomic<std::int64_t> doneB{0};
    // Whether a backup has ended, and with which outcome.
    std::atomic<bool> ended{false};
    std::atomic<bool> ended3{false};
    std::atomic<bool> ended4{false};
    std::atomic<bool> ended5{false};
    std::atomic<bool> ended6{false};
    std::atomic<bool> ended8{false};
    std::atomic<bool> ended9{false};
    std::atomic<bool> ended10{false};
    // The mark and the switches of the types of these numbers.
    std::atomic<bool> mark10{false};
    std::atomic<bool> switch24{false};
    std::atomic<bool> switch32{false};
    std::atomic<bool> switch34{false};
    std::atomic<bool> switch39{false};
    // Whether messages add samples to the rings; true for the status of the process.
    const bool sampling;

  private:
    void applyEvent(const EventMessage& event);
    void applySnapshot(const SnapshotMessage& snapshot);
    // Returns the flag of an outcome, or null for a type without one.
    std::atomic<bool>* outcomeOf(EventType type) noexcept;
    void endWith(std::atomic<bool>* outcome) noexcept;
    void renewRate(std::atomic<float>& rate, std::int32_t span) noexcept;

    std::atomic<std::uint32_t> ticks_{0};
};

} // namespace tavi
