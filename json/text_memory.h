// SPDX-License-Identifier: Apache-2.0
// Writing into a string's memory without filling it with zeros first.
#pragma once

#include <cstddef>
#include <string>

namespace json::detail {

/// Gives `text` memory for `capacity` bytes, keeps what is in it, and calls `write` with the
/// memory. `write` returns the new length, at most `capacity`, and throws nothing.
template <typename Write>
void overwrite(std::string& text, std::size_t capacity, Write write) {
#ifdef __cpp_lib_string_resize_and_overwrite
    text.resize_and_overwrite(capacity, [&](char* memory, std::size_t) { return write(memory); });
#else
    text.resize(capacity);
    text.resize(write(text.data()));
#endif
}

}  // namespace json::detail
