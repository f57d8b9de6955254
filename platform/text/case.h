// SPDX-License-Identifier: Apache-2.0
// Upper and lower case of ASCII letters, which depend on no locale. All other bytes stay as they
// are.
#pragma once

#include <algorithm>
#include <string>
#include <string_view>

namespace platform::text {

/// `c` in lower case.
constexpr char toLowerAscii(char c) noexcept {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

/// `text` in lower case.
inline std::string toLowerAscii(std::string_view text) {
    std::string lower(text);
    std::transform(lower.begin(), lower.end(), lower.begin(),
                   [](char c) { return toLowerAscii(c); });
    return lower;
}

/// Whether `left` and `right` differ in the case of letters at most.
inline bool equalIgnoringCase(std::string_view left, std::string_view right) {
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](char l, char r) { return toLowerAscii(l) == toLowerAscii(r); });
}

}  // namespace platform::text
