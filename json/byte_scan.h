// Finding the few bytes of a string that need attention, eight bytes at a time.
#pragma once

#include <cstdint>
#include <cstring>

namespace json::detail {

constexpr std::uint64_t repeated(std::uint8_t byte) {
    return 0x0101010101010101u * byte;
}

/// Non-zero exactly when one of the eight bytes of `word` is less than `limit`, at most 0x80.
constexpr std::uint64_t hasLess(std::uint64_t word, std::uint8_t limit) {
    return (word - repeated(limit)) & ~word & repeated(0x80);
}

constexpr std::uint64_t hasByte(std::uint64_t word, std::uint8_t byte) {
    return hasLess(word ^ repeated(byte), 1);
}

/// What ends a run of plain bytes in a string of JSON text.
struct QuoteOrBackslash {
    static constexpr bool in(std::uint64_t word) {
        return (hasByte(word, '"') | hasByte(word, '\\')) != 0;
    }
    static constexpr bool is(char c) { return c == '"' || c == '\\'; }
};

/// What cannot be written into a string of JSON text as it stands.
struct NeedsEscape {
    static constexpr bool in(std::uint64_t word) {
        return (hasByte(word, '"') | hasByte(word, '\\') | hasLess(word, 0x20)) != 0;
    }
    static constexpr bool is(char c) {
        return QuoteOrBackslash::is(c) || static_cast<unsigned char>(c) < 0x20;
    }
};

/// The first byte from `position` on that is one of `Bytes`, or `end`.
template <typename Bytes>
const char* findFirst(const char* position, const char* end) {
    for (; end - position >= 8; position += 8) {
        std::uint64_t word;
        std::memcpy(&word, position, sizeof word);
        if (Bytes::in(word))
            break;
    }
    while (position != end && !Bytes::is(*position))
        ++position;
    return position;
}

}  // namespace json::detail
