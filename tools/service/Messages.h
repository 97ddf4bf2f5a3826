#pragma once

#include <cstdint>
#include <string>
#include <string_view>

// The frames of both pipes, as bytes.
namespace service {

enum MessageType : std::uint32_t {
    snapshotOfAll = 20,
    restoreStarted = 51,
    restoreEnded = 52,
    restoreTotal = 53,
    itemStarted = 54,
    itemEnded = 55,
    bytesDone = 56
};

std::string header(std::uint32_t type, std::uint32_t length);
std::string eventFrame(std::uint32_t type, std::uint64_t value = 0, std::wstring_view text = {}, std::uint32_t code = 0,
                       std::uint32_t flag = 0);
std::string snapshotFrame(std::uint32_t state);

// True for the frame that asks for the end of the restore: type 52, whatever its fields.
bool isCancelCommand(std::string_view frame);

} // namespace service
