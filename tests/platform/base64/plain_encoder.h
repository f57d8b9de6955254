// SPDX-License-Identifier: Apache-2.0
// A base64 encoder with nothing in common with the one under test.
#pragma once

#include <string>
#include <string_view>

namespace platform::base64 {

inline constexpr std::string_view alphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

inline std::string plainlyEncoded(std::string_view bytes) {
    std::string text;
    unsigned bits = 0;
    int count = 0;
    for (const char byte : bytes) {
        bits = (bits << 8) | static_cast<unsigned char>(byte);
        for (count += 8; count >= 6; count -= 6) {
            text += alphabet[(bits >> (count - 6)) & 63];
        }
    }
    if (count > 0) {
        text += alphabet[(bits << (6 - count)) & 63];
    }
    text.append((4 - text.size() % 4) % 4, '=');
    return text;
}

}  // namespace platform::base64
