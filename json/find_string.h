// SPDX-License-Identifier: Apache-2.0
// Looks up one member in a JSON text without parsing it.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace json {

/// The string under `key` in the object that `text` begins with, as parse(text) would give it;
/// nothing when there is no such member, when it is not a string, or when the text is malformed
/// before or in it. Of several members with that key the first counts. The text after it, and that
/// within other members, is not checked.
///
/// Linear in the length of the text. Takes memory for one key or string at a time, whatever else
/// the text holds. Throws nothing but std::bad_alloc.
std::optional<std::string> findString(std::string_view text, std::string_view key);

}  // namespace json
