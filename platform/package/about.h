// SPDX-License-Identifier: Apache-2.0
// Errors that say what they are about.
#pragma once

#include <stdexcept>
#include <string>
#include <string_view>

namespace platform::package {

/// Does `work`, and puts `subject` before the text of a std::runtime_error that it throws.
template <class Work>
auto about(const std::string& subject, Work work) {
    try {
        return work();
    } catch (const std::runtime_error& error) {
        throw std::runtime_error(subject + " " + error.what());
    }
}

/// `text` in quotation marks, with question marks for the control characters in it: a zero would
/// end the text of an exception.
inline std::string quoted(std::string_view text) {
    std::string result = "\"";
    for (const char c : text) {
        result += c >= '\0' && c < ' ' ? '?' : c;
    }
    return result += '"';
}

}  // namespace platform::package
