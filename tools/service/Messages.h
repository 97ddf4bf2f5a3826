#pragma once

#include <cstdint>
#include <string>
#include <string_view>

// The frames of both pipes, as bytes.
namespace service {

// Type of the message that a client gets first: whether a restore runs.
constexpr std::uint32_t kSnapshot = 20;
// Types of the messages about a restore. A client sends kRestoreEnded to cancel it.
constexpr std::uint32_t kRestoreStarted = 51;
constexpr std::uint32_t kRestoreEnded = 52;
// The value is the number of bytes of all files.
constexpr std::uint32_t kRestoreTotal = 53;
// The text is the path of the file.
constexpr std::uint32_t kItemStarted = 54;
constexpr std::uint32_t kItemEnded = 55;
// The value is the number of bytes since the last message of this type.
constexpr std::uint32_t kBytesDone = 56;

std::string header(std::uint32_t type, std::uint32_t length);
std::string eventFrame(std::uint32_t type, std::uint64_t value = 0, std::wstring_view text = {});
// `state` is kRestoreStarted or kRestoreEnded.
std::string snapshotFrame(std::uint32_t state);

bool isCancelCommand(std::string_view frame);

} // namespace service
