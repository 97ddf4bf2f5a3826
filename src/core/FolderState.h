#pragma once

#include <cstdint>

namespace tavi {

// The state of a folder in the service's configuration, and of a node in the tree of default exclusions: whether the
// rule of the folder itself is on, and a summary of what is beneath it. The service may store other numbers, which
// entries inherit unchanged.
enum class FolderState : std::uint32_t {
    off = 0,       // off, and nothing beneath is on
    on = 1,        // on, and nothing beneath is on
    offSomeOn = 2, // off; some entries beneath are on
    onSomeOn = 3,  // on; some entries beneath are on
    offMostOn = 4, // off; entries without a rule count as on, others are off
    onMostOn = 5,  // on; entries without a rule count as on, others are off
    offAllOn = 6,  // off; everything beneath is on
    allOn = 7,     // on with everything beneath
    allOff = 8,    // off with everything beneath
};

constexpr bool isRuleOn(FolderState state) noexcept
{
    return state == FolderState::on || state == FolderState::onSomeOn || state == FolderState::onMostOn ||
           state == FolderState::allOn;
}

// Returns the state of an entry without a rule of its own whose nearest ancestor with a rule has this state.
constexpr FolderState inherited(FolderState state) noexcept
{
    switch (state) {
    case FolderState::off:
    case FolderState::offSomeOn:
        return FolderState::allOff;
    case FolderState::on:
    case FolderState::onSomeOn:
    case FolderState::onMostOn:
        return FolderState::allOn;
    default:
        return state;
    }
}

} // namespace tavi
