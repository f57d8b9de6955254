// SPDX-License-Identifier: Apache-2.0
// Base64 both ways. What is encoded decodes to the same bytes, and any text decodes to what a
// decoder that takes it a character at a time makes of it, or is refused by both.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "platform/base64/base64.h"

namespace {

using platform::DataBuffer;

std::optional<std::string> decodedPlainly(std::string_view text) {
    constexpr std::string_view alphabet =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    constexpr std::string_view space = " \t\n\v\f\r";
    std::string digits;
    std::size_t padding = 0;
    for (const char c : text) {
        if (space.find(c) != std::string_view::npos) {
            continue;
        }
        if (c == '=') {
            ++padding;
        } else if (alphabet.find(c) == std::string_view::npos || padding > 0) {
            return std::nullopt;
        } else {
            digits += c;
        }
    }
    const std::size_t missing = (4 - digits.size() % 4) % 4;
    if (missing == 3 || (padding != 0 && padding != missing)) {
        return std::nullopt;
    }
    std::string bytes;
    std::uint32_t bits = 0;
    int count = 0;
    for (const char c : digits) {
        bits = bits << 6 | static_cast<std::uint32_t>(alphabet.find(c));
        count += 6;
        if (count >= 8) {
            count -= 8;
            bytes += static_cast<char>(bits >> count & 0xFF);
        }
    }
    const bool isCut = (bits & ((1U << count) - 1)) != 0;
    return isCut ? std::nullopt : std::optional(bytes);
}

std::optional<std::string> decoded(std::string_view text) {
    try {
        return std::string(platform::base64decode(text).view());
    } catch (const std::runtime_error&) {
        return std::nullopt;
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    const DataBuffer encoded = platform::base64encode(DataBuffer::copyOf(input));
    if (encoded.length() != (size + 2) / 3 * 4 || decoded(encoded.view()) != input ||
        decoded(input) != decodedPlainly(input)) {
        std::abort();
    }
    return 0;
}
