#include "link/TransferStatus.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <string_view>

#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::uint32_t kSmallRing = 1024;
constexpr std::uint32_t kLargeRing = 65536;
constexpr std::uint32_t kTickMs = 250;
constexpr std::int32_t kShortSpanMs = 5000;
constexpr std::int32_t kLongSpanMs = 60000;
// The longest path of Windows: a status text names a file or a folder, but its length is the peer's.
constexpr std::size_t kMaxTextLength = 32767;
// From bytes per millisecond to bits per second.
constexpr double kBitsPerSecond = 8000;

// The amounts are the service's and may be anything: sums wrap around, which is defined for unsigned numbers only.
std::int64_t sum(std::int64_t value, std::uint64_t added) noexcept
{
    return static_cast<std::int64_t>(static_cast<std::uint64_t>(value) + added);
}

void add(std::atomic<std::int64_t>& amount, std::uint64_t added) noexcept
{
    amount = sum(amount, added);
}

void addUpTo(const std::atomic<std::int64_t>& total, std::atomic<std::int64_t>& done, std::uint64_t added) noexcept
{
    const std::int64_t limit = total;
    const std::int64_t result = sum(done, added);
    done = result > limit ? limit : result;
}

// Applies to the types of events and to the states of snapshots alike.
bool endsBackup(EventType type) noexcept
{
    return type <= EventType::backupEnded10 && type != EventType::backupReset && type != EventType::ignored7;
}

// Truncates; out-of-range numbers become the nearest limit and NaN becomes 0.
template <class Integer>
Integer truncated(double value) noexcept
{
    if (std::isnan(value))
        return 0;
    if (value <= static_cast<double>(std::numeric_limits<Integer>::min()))
        return std::numeric_limits<Integer>::min();
    if (value >= static_cast<double>(std::numeric_limits<Integer>::max()))
        return std::numeric_limits<Integer>::max();
    return static_cast<Integer>(value);
}

} // namespace

void PublishedText::set(const wxString& text)
{
    std::wstring_view kept = view(text).substr(0, kMaxTextLength);
    if (kept.length() < text.length() && isHighSurrogate(static_cast<char32_t>(kept.back())))
        kept.remove_suffix(1);
    text_.replace(RefPtr<Shared>(new Shared(wxString(kept.data(), kept.length()))));
}

wxString PublishedText::get() const
{
    const RefPtr<Shared> shared = text_.acquire();
    return shared ? shared->text : wxString();
}

TransferStatus::TransferStatus(bool samplingOn, TickSource clock)
    : restoreRing(samplingOn ? kLargeRing : 1, clock), ringA(samplingOn ? kSmallRing : 1, clock),
      ringB(samplingOn ? kLargeRing : 1, clock), sampling(samplingOn)
{
}

void TransferStatus::apply(const PipeMessage& message)
{
    if (message.kind() == MessageKind::event)
        applyEvent(static_cast<const EventMessage&>(message));
    else if (message.kind() == MessageKind::snapshot)
        applySnapshot(static_cast<const SnapshotMessage&>(message));
}

void TransferStatus::resetBackup()
{
    statusTextA.clear();
    statusTextB.clear();
    ringA.clearRing();
    ringB.clearRing();
    for (auto* const rate : {&rate0, &rate1, &rate2})
        *rate = 0;
    for (auto* const amount : {&totalA, &totalB, &doneA, &doneB})
        *amount = 0;
    // All flags but restoreStarted: backups start and end while a restore runs.
    for (auto* const flag : {&ended, &ended3, &switch34, &switch32, &switch39, &switch24, &mark10, &ended10, &ended4,
                             &ended6, &ended8, &ended5, &ended9})
        *flag = false;
}

void TransferStatus::resetRestore()
{
    restoreText.clear();
    restoreRing.clearRing();
    restoreRateShort = 0;
    restoreRateLong = 0;
    restoreTotal = 0;
    restoreDone = 0;
    restoreStarted = false;
}

std::atomic<bool>* TransferStatus::outcomeOf(EventType type) noexcept
{
    switch (type) {
    case EventType::backupEnded3:
        return &ended3;
    case EventType::backupEnded4:
        return &ended4;
    case EventType::backupEnded5:
        return &ended5;
    case EventType::backupEnded6:
        return &ended6;
    case EventType::backupEnded8:
        return &ended8;
    case EventType::backupEnded9:
        return &ended9;
    case EventType::backupEnded10:
        return &ended10;
    default:
        return nullptr;
    }
}

void TransferStatus::endWith(std::atomic<bool>* outcome) noexcept
{
    ended = true;
    if (outcome)
        *outcome = true;
}

void TransferStatus::applyEvent(const EventMessage& event)
{
    const EventType type = event.type();
    if (endsBackup(type)) {
        resetBackup();
        endWith(outcomeOf(type));
    }
    switch (type) {
    case EventType::backupReset:
        resetBackup();
        break;
    case EventType::backupEnded10:
        mark10 = true;
        totalB = static_cast<std::int64_t>(event.value);
        totalA = static_cast<std::int64_t>(event.value);
        break;
    case EventType::textA:
        statusTextA.set(*event.text);
        break;
    case EventType::textAEnded:
        statusTextA.clear();
        break;
    case EventType::textB:
        statusTextB.set(*event.text);
        break;
    case EventType::textBEnded:
        statusTextB.clear();
        break;
    case EventType::doneA:
        addUpTo(totalA, doneA, event.value);
        if (sampling)
            ringA.addSample(event.value);
        break;
    case EventType::doneB:
        addUpTo(totalB, doneB, event.value);
        if (sampling && event.flag != 0)
            ringB.addSample(event.value);
        break;
    case EventType::moreA:
        add(totalA, event.value);
        break;
    case EventType::moreB:
        add(totalB, event.value);
        break;
    case EventType::switch24On:
    case EventType::switch24Off:
        switch24 = type == EventType::switch24On;
        break;
    case EventType::switch32On:
    case EventType::switch32Off:
        switch32 = type == EventType::switch32On;
        break;
    case EventType::switch34On:
    case EventType::switch34Off:
        switch34 = type == EventType::switch34On;
        break;
    case EventType::mark10Off:
        mark10 = false;
        break;
    case EventType::switch39On:
    case EventType::switch39Off:
        switch39 = type == EventType::switch39On;
        break;
    case EventType::restoreStarted:
        resetRestore();
        restoreStarted = true;
        break;
    case EventType::restoreEnded:
        resetRestore();
        break;
    case EventType::restoreTotal:
        restoreTotal = static_cast<std::int64_t>(event.value);
        break;
    case EventType::restoreItem:
        restoreText.set(*event.text);
        break;
    case EventType::restoreItemEnded:
        restoreText.clear();
        break;
    case EventType::restoreDone:
        addUpTo(restoreTotal, restoreDone, event.value);
        if (sampling)
            restoreRing.addSample(event.value);
        break;
    case EventType::restoreMore:
        add(restoreTotal, event.value);
        break;
    default:
        break;
    }
}

void TransferStatus::applySnapshot(const SnapshotMessage& snapshot)
{
    for (RateRing* const ring : {&ringA, &ringB, &restoreRing})
        ring->clearRing();
    for (PublishedText* const text : {&statusTextA, &statusTextB, &restoreText})
        text->clear();
    for (auto* const rate : {&rate0, &rate1, &restoreRateShort, &rate2, &restoreRateLong})
        *rate = 0;
    // counter2 is not read, and totalB and the restore's amounts keep their values.
    doneA = static_cast<std::int64_t>(snapshot.counter1);
    totalA = static_cast<std::int64_t>(snapshot.counter0);
    doneB = static_cast<std::int64_t>(snapshot.counter3);

    const auto state = static_cast<EventType>(snapshot.state);
    if (endsBackup(state))
        endWith(state == EventType::backupEnded2 ? &ended3 : outcomeOf(state));
    switch (state) {
    case EventType::backupReset:
        // Also zeroes the amounts that were just set.
        resetBackup();
        break;
    case EventType::backupEnded10:
        mark10 = true;
        break;
    case EventType::restoreStarted:
        restoreStarted = true;
        break;
    case EventType::restoreEnded:
        resetRestore();
        break;
    default:
        break;
    }
}

void TransferStatus::renewRate(std::atomic<float>& rate, std::int32_t span) noexcept
{
    // A finished restore, or one whose total is not known, has no speed.
    rate = restoreDone < restoreTotal ? static_cast<float>(restoreRing.rateOver(span) * kBitsPerSecond) : 0.0F;
}

void TransferStatus::timerTick() noexcept
{
    for (RateRing* const ring : {&ringA, &ringB, &restoreRing})
        ring->addSample(0);
    const std::uint32_t milliseconds = ++ticks_ * kTickMs;
    if (milliseconds % 1000 == 0)
        renewRate(restoreRateShort, kShortSpanMs);
    if (milliseconds % 10000 == 0)
        renewRate(restoreRateLong, kLongSpanMs);
}

std::optional<std::uint32_t> TransferStatus::remainingSeconds() const noexcept
{
    // This number of seconds means "unknown".
    constexpr std::uint32_t kUnknown = UINT32_MAX;
    const double rate = restoreRateLong;
    if (!(rate * 0.001 >= 1.0))
        return std::nullopt;
    const auto left = static_cast<std::uint64_t>(restoreTotal.load()) - static_cast<std::uint64_t>(restoreDone.load());
    const auto bitsPerSecond = std::max<std::uint64_t>(truncated<std::uint64_t>(rate), 1);
    const auto seconds = static_cast<std::uint32_t>(left * 8 / bitsPerSecond);
    return seconds == kUnknown ? std::nullopt : std::optional(seconds);
}

std::int32_t TransferStatus::barPosition() const noexcept
{
    const std::int64_t total = restoreTotal;
    if (total == 0)
        return 0;
    return truncated<std::int32_t>(static_cast<double>(restoreDone.load()) * kBarRange / static_cast<double>(total));
}

std::uint64_t TransferStatus::restoreSpeed() const noexcept
{
    return static_cast<std::uint64_t>(truncated<std::int64_t>(restoreRateShort.load()));
}

} // namespace tavi
