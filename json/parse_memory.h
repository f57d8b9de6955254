// SPDX-License-Identifier: Apache-2.0
// Estimates how much memory a JSON text will take when it is parsed.
#pragma once

#include <cstddef>
#include <string_view>

namespace json {

/// An upper bound on the bytes that parse(text) allocates at any one time, its result included,
/// with what glibc's malloc adds to each allocation. For a text of many small values it is up to
/// three times what is really used, for long strings hardly more than their length.
///
/// Counts the brackets, braces and commas outside of strings, and the strings. Linear in the length
/// of the text, at a fraction of the time that parsing it takes. Allocates nothing.
std::size_t memoryToParse(std::string_view text) noexcept;

/// What memoryToParse() gives at most for a text of `length` bytes, whatever they are.
std::size_t mostMemoryToParse(std::size_t length) noexcept;

}  // namespace json
