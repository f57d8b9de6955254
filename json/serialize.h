// SPDX-License-Identifier: Apache-2.0
// The text writer: a Value to JSON text.
#pragma once

#include <cstddef>
#include <functional>
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

/// Resizes the memory of a text to `size` bytes, keeping its contents, and returns its beginning.
using TextMemory = std::function<char*(std::size_t size)>;

/// Writes the same text into memory from `resize`, which is called last with the length of the
/// text. Returns false, after a part of it, when the text has more than `maxLength` bytes. Asks for
/// little more than `maxLength` bytes, however long the text would be. Throws what `resize` throws.
bool serialize(const Value& value, std::size_t maxLength, const TextMemory& resize);

}  // namespace json
