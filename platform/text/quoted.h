// SPDX-License-Identifier: Apache-2.0
// Text in messages for people.
#pragma once

#include <string>
#include <string_view>

namespace platform::text {

/// `text` in quotation marks, with question marks for the control characters in it: a zero would
/// end the text of an exception.
inline std::string quoted(std::string_view text) {
    std::string result = "\"";
    for (const char c : text) {
        result += c >= '\0' && c < ' ' ? '?' : c;
    }
    return result += '"';
}

}  // namespace platform::text
