// SPDX-License-Identifier: Apache-2.0
// The content of open files, compared and copied.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace host {

/// The size of `file` in bytes. Throws std::system_error.
std::size_t sizeOf(int file);

/// Whether `file` holds just `bytes`. False if it cannot be read.
bool hasContent(int file, std::string_view bytes);

/// The same for the bytes that the string `literal` of a JSON text stands for, quotes included.
/// They are compared without being held in memory at once. False if it is malformed.
bool hasContentOf(int file, std::string_view literal);

/// Whether two files hold the same. False if one cannot be read.
bool haveSameContent(int one, int other);

/// All that `file` holds. Throws std::system_error.
std::string readContent(int file);

/// Writes all that `from` holds to the beginning of `to`. Throws std::system_error.
void copyContent(int from, int to);

}  // namespace host
