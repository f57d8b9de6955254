// SPDX-License-Identifier: Apache-2.0
// The text writer: a Value to JSON text.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "json/value.h"

namespace json {

/// The value as compact JSON text, object members in the order of their keys.
///
/// Strings are bytes: the quote, the backslash and bytes below 0x20 are escaped and every other
/// byte is written as it stands, so a string in any charset comes back from the parser byte for
/// byte. A double or float is the shortest text that reads back to the same value, an integral one
/// without ".0"; NaN, the infinities and `Undefined`, which JSON lacks, are `null`.
///
/// Takes time linear in the size of the text, and no stack in proportion to the nesting.
std::string serialize(const Value& value);

/// The same, or nothing when the text has more than `maxLength` bytes. Takes memory for little more
/// than `maxLength` bytes, however long the text would be.
std::optional<std::string> serialize(const Value& value, std::size_t maxLength);

}  // namespace json
