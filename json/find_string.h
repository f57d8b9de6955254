// SPDX-License-Identifier: Apache-2.0
// Looking one member up in a JSON text that is not parsed.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace json {

/// The string that the object which `text` begins with has under `key`, as parse(text) would give
/// it; nothing when there is no such member, when it is no string, or when the text is malformed
/// before or in it. Of several members of that key the first counts. What comes behind it, and what
/// is within other members, is not checked.
///
/// Linear in the length of the text. Takes memory for one key or string at a time, whatever else
/// the text holds. Throws nothing but std::bad_alloc.
std::optional<std::string> findString(std::string_view text, std::string_view key);

}  // namespace json
