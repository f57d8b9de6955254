// SPDX-License-Identifier: Apache-2.0
// Little-endian numbers in byte sequences.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

namespace platform::package::zip {

/// The number of `count` bytes at `offset`, which lie within `bytes`.
inline std::uint64_t readNumber(std::span<const std::uint8_t> bytes, std::size_t offset,
                                std::size_t count) {
    std::uint64_t value = 0;
    for (std::size_t i = count; i-- > 0;) {
        value = value << 8U | bytes[offset + i];
    }
    return value;
}

inline std::uint16_t read16(std::span<const std::uint8_t> bytes, std::size_t offset) {
    return static_cast<std::uint16_t>(readNumber(bytes, offset, 2));
}

inline std::uint32_t read32(std::span<const std::uint8_t> bytes, std::size_t offset) {
    return static_cast<std::uint32_t>(readNumber(bytes, offset, 4));
}

inline std::uint64_t read64(std::span<const std::uint8_t> bytes, std::size_t offset) {
    return readNumber(bytes, offset, 8);
}

inline void append16(std::string& bytes, std::uint16_t value) {
    bytes += static_cast<char>(value & 0xFFU);
    bytes += static_cast<char>(value >> 8U);
}

inline void append32(std::string& bytes, std::uint32_t value) {
    append16(bytes, static_cast<std::uint16_t>(value & 0xFFFFU));
    append16(bytes, static_cast<std::uint16_t>(value >> 16U));
}

}  // namespace platform::package::zip
