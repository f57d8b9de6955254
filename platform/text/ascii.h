// SPDX-License-Identifier: Apache-2.0
// Character tests on single bytes that depend on no locale.
#pragma once

namespace platform::text {

/// True for space, tab, line feed, vertical tab, form feed and carriage return.
constexpr bool isspace_ascii(char c) noexcept {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

/// True for '0' to '9'.
constexpr bool isdigit_ascii(char c) noexcept {
    return c >= '0' && c <= '9';
}

}  // namespace platform::text
