#pragma once

#include <string>

#include "link/PipeMessage.h"

namespace tavi::test {

// Converts two hexadecimal digits per byte, with blanks between bytes.
inline std::string bytes(const std::string& digits)
{
    std::string out;
    for (std::size_t at = 0; (at = digits.find_first_not_of(' ', at)) != std::string::npos; at += 2)
        out += static_cast<char>(std::stoi(digits.substr(at, 2), nullptr, 16));
    return out;
}

inline MessageText text(const wxString& content)
{
    return std::make_shared<const wxString>(content);
}

inline auto event(EventType type, std::uint64_t value = 0, const wxString& content = wxString(), std::uint32_t flag = 0)
{
    return std::make_unique<EventMessage>(type, 0, value, flag, text(content));
}

inline std::string serialized(const PipeMessage& message)
{
    const auto buffer = MessageBuffer::create();
    message.serialize(*buffer);
    return {reinterpret_cast<const char*>(buffer->data()), buffer->length()};
}

} // namespace tavi::test
