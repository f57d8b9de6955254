// SPDX-License-Identifier: Apache-2.0
// Looking at the eight bytes of a word at once, which any machine can.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace json::detail {

// The first byte in memory is the lowest of a word.
static_assert(std::endian::native == std::endian::little);

/// `byte` in each byte of a word.
constexpr std::uint64_t repeated(std::uint8_t byte) {
    return 0x0101'0101'0101'0101u * byte;
}

/// The highest bit of each byte of `word` that is zero, and no other bit.
constexpr std::uint64_t zeroBytes(std::uint64_t word) {
    constexpr std::uint64_t low = repeated(0x7F);
    return ~(((word & low) + low) | word | low);
}

constexpr std::ptrdiff_t shortLength = 16;

/// The length of the string of JSON text that begins at `in`, from where `shortLength` bytes can be
/// read, if its closing quote is among them and no backslash before that; otherwise `shortLength`.
inline std::ptrdiff_t lengthOfShort(const char* in) {
    for (std::ptrdiff_t i = 0; i < shortLength; i += 8) {
        std::uint64_t word;
        std::memcpy(&word, in + i, sizeof word);
        const std::uint64_t quotes = zeroBytes(word ^ repeated('"'));
        const std::uint64_t found = quotes | zeroBytes(word ^ repeated('\\'));
        if (found != 0) {
            const int first = std::countr_zero(found);
            return (quotes >> first & 1) != 0 ? i + first / 8 : shortLength;
        }
    }
    return shortLength;
}

}  // namespace json::detail
