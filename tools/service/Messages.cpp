#include "Messages.h"

#include "Text.h"

namespace service {
namespace {

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

std::uint32_t u32At(std::string_view bytes, std::size_t at)
{
    std::uint32_t value = 0;
    for (std::size_t i = 0; i < 4; ++i)
        value |= std::uint32_t{static_cast<unsigned char>(bytes[at + i])} << 8 * i;
    return value;
}

} // namespace

std::string header(std::uint32_t type, std::uint32_t length)
{
    return u32(type) + u32(length);
}

std::string eventFrame(std::uint32_t type, std::uint64_t value, std::wstring_view text, std::uint32_t code,
                       std::uint32_t flag)
{
    const std::string bytes = toUtf8(text);
    const auto count = static_cast<std::uint32_t>(bytes.size());
    return header(type, 20 + count) + u32(code) + u64(value) + u32(flag) + u32(count) + bytes;
}

std::string snapshotFrame(std::uint32_t state)
{
    return header(snapshotOfAll, 36) + u32(state) + std::string(32, '\0');
}

bool isCancelCommand(std::string_view frame)
{
    return frame.size() >= 28 && u32At(frame, 0) == restoreEnded && u32At(frame, 4) == frame.size() - 8 &&
           u32At(frame, 24) == frame.size() - 28;
}

} // namespace service
