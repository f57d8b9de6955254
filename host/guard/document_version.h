// SPDX-License-Identifier: Apache-2.0
// The version of a document: a token made from its content.
#pragma once

#include <string>
#include <string_view>

namespace host {

/// 32 hexadecimal digits, the same for two contents only when they are equal: the first half of the
/// SHA-256 sum of what can be read from `file` from its beginning. The file's position does not
/// change. Throws std::system_error when it cannot be read, and std::runtime_error at once when it
/// is longer than a document may be. Linear in the file's size.
std::string versionOf(int file);

/// The same digits for `bytes`.
std::string digestOf(std::string_view bytes);

}  // namespace host
