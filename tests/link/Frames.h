#pragma once

#include <cstdio>
#include <string>

#include "link/PipeMessage.h"

// Frames as readable tables: two hexadecimal digits a byte, blanks anywhere.
namespace tavi::test {

inline std::string bytes(const std::string& digits)
{
    std::string out, pair;
    for (const char digit : digits) {
        if (digit != ' ')
            pair += digit;
        if (pair.size() == 2) {
            out += static_cast<char>(std::stoi(pair, nullptr, 16));
            pair.clear();
        }
    }
    return out;
}

inline std::string hex(const std::string& text)
{
    std::string out;
    for (const char byte : text) {
        char pair[3];
        std::snprintf(pair, sizeof(pair), "%02x", static_cast<unsigned char>(byte));
        out += pair;
    }
    return out;
}

inline MessageText text(const wxString& content)
{
    return std::make_shared<const wxString>(content);
}

inline std::string serialised(const PipeMessage& message)
{
    const HeldBuffer buffer;
    message.serialise(*buffer);
    return {reinterpret_cast<const char*>(buffer->data()), buffer->length()};
}

} // namespace tavi::test
