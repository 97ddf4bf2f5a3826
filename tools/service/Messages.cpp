#include "Messages.h"

#include "common/Text.h"

namespace service {
namespace {

// An event has two codes of 4 bytes, a value of 8 and the length of its text.
constexpr std::uint32_t kEventFieldBytes = 20;
constexpr std::uint32_t kSnapshotFieldBytes = 36;

std::string u32(std::uint32_t value)
{
    std::string bytes;
    for (int shift = 0; shift < 32; shift += 8)
        bytes += static_cast<char>(value >> shift & 0xff);
    return bytes;
}

std::string u64(std::uint64_t value)
{
    return u32(static_cast<std::uint32_t>(value)) + u32(static_cast<std::uint32_t>(value >> 32));
}

} // namespace

std::string header(std::uint32_t type, std::uint32_t length)
{
    return u32(type) + u32(length);
}

std::string eventFrame(std::uint32_t type, std::uint64_t value, std::wstring_view text)
{
    const std::string bytes = tools::toUtf8(text);
    const auto length = static_cast<std::uint32_t>(bytes.size());
    return header(type, kEventFieldBytes + length) + u32(0) + u64(value) + u32(0) + u32(length) + bytes;
}

std::string snapshotFrame(std::uint32_t state)
{
    return header(kSnapshot, kSnapshotFieldBytes) + u32(state) + std::string(kSnapshotFieldBytes - 4, '\0');
}

bool isCancelCommand(std::string_view frame)
{
    return frame == eventFrame(kRestoreEnded);
}

} // namespace service
