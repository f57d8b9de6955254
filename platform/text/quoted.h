// SPDX-License-Identifier: Apache-2.0
// Text from outside in messages for people: in quotation marks, or as printable ASCII.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace platform::text {

/// `text` in quotation marks, with question marks for the control characters in it: a zero would
/// end the text of an exception.
inline std::string quoted(std::string_view text) {
    std::string result = "\"";
    for (const char c : text) {
        result += static_cast<unsigned char>(c) < ' ' ? '?' : c;
    }
    return result += '"';
}

/// `byte` as \xNN, in upper-case digits.
inline std::string escapedByte(char byte) {
    constexpr std::string_view digits = "0123456789ABCDEF";
    const auto value = static_cast<unsigned char>(byte);
    return {'\\', 'x', digits[value >> 4U], digits[value & 0x0FU]};
}

/// The first `longest` bytes of `text` in printable ASCII, other bytes as \xNN; dots follow where
/// that is not all of it. For log lines and error texts, so that the text cannot break them up,
/// forge or fill them.
inline std::string printable(std::string_view text, std::size_t longest = 200) {
    std::string result;
    for (const char c : text.substr(0, longest)) {
        if (c >= 0x20 && c < 0x7F) {
            result += c;
        } else {
            result += escapedByte(c);
        }
    }
    return text.size() > longest ? result + "..." : result;
}

}  // namespace platform::text
