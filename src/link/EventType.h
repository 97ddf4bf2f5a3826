#pragma once

#include <cstdint>

namespace tavi {

// The types of the messages on both pipes, which share one code space. The state of a snapshot uses the types up to 10
// and those of a restore's start and end. The service measures a backup by two amounts, A and B. A number in a name
// means that only the service knows more.
enum class EventType : std::uint32_t {
    backupEnded0 = 0,      // a backup ended; the status has no flag for this outcome
    backupReset = 1,       // everything known of the backup is void
    backupEnded2 = 2,      // as 0; as the state of a snapshot it has the flag of outcome 3
    backupEnded3 = 3,      // a backup ended with outcome 3
    backupEnded4 = 4,      // a backup ended with outcome 4
    backupEnded5 = 5,      // a backup ended with outcome 5
    backupEnded6 = 6,      // a backup ended with outcome 6
    ignored7 = 7,          // changes nothing
    backupEnded8 = 8,      // a backup ended with outcome 8
    backupEnded9 = 9,      // a backup ended with outcome 9
    backupEnded10 = 10,    // a backup ended with outcome 10; sets the mark and, to its value, both totals
    textA = 11,            // the first status text of the backup
    textAEnded = 12,       // the first text no longer applies
    textB = 13,            // the second status text of the backup
    textBEnded = 14,       // the second text no longer applies
    ignored15 = 15,        // changes nothing
    doneA = 16,            // adds the value to the done amount of A
    doneB = 17,            // adds the value to the done amount of B, and to its rate if the flag is set
    moreA = 18,            // adds the value to the total of A
    moreB = 19,            // adds the value to the total of B
    snapshot = 20,         // the state and the amounts as they are now (SnapshotMessage)
    item = 21,             // a number, a flag and a text (ItemMessage), which the module does not use
    textTriple = 22,       // three texts (TextTripleMessage), which the module does not use
    counter = 23,          // four numbers (CounterMessage), which the module does not use
    switch24On = 24,       // the first switch of the backup is on
    switch24Off = 25,      // the first switch is off
    switch32On = 32,       // the second switch is on
    switch32Off = 33,      // the second switch is off
    switch34On = 34,       // the third switch is on
    switch34Off = 35,      // the third switch is off
    mark10Off = 36,        // clears the mark that 10 sets
    switch39On = 39,       // the fourth switch is on
    switch39Off = 40,      // the fourth switch is off
    restoreStarted = 51,   // a restore started and looks for its first file
    restoreEnded = 52,     // a restore ended; as a command: end the running one
    restoreTotal = 53,     // the value is the number of bytes to restore
    restoreItem = 54,      // the text names the item being restored
    restoreItemEnded = 55, // that text no longer applies
    restoreDone = 56,      // adds the value to the bytes restored
    restoreMore = 57,      // adds the value to the bytes to restore
};

// Returns whether a frame of this type is a message. Any other frame makes the reader close the connection.
constexpr bool isEventType(std::uint32_t type) noexcept
{
    constexpr std::uint32_t kGaps[][2] = {{26, 31}, {37, 38}, {41, 50}};
    for (const auto& [first, last] : kGaps) {
        if (type >= first && type <= last)
            return false;
    }
    return type <= static_cast<std::uint32_t>(EventType::restoreMore);
}

} // namespace tavi
