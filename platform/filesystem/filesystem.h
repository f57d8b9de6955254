// SPDX-License-Identifier: Apache-2.0
// Asks the file system about UTF-16 paths.
#pragma once

#include <string>
#include <string_view>

namespace platform::filesystem {

/// Whether `path` names something, of whatever kind, symbolic links followed.
/// Throws std::runtime_error when the path is not valid UTF-16 or holds a zero, and
/// std::filesystem::filesystem_error when the system cannot tell (no permission, name too long).
/// A path that no file can have for its length takes no memory.
bool exists(std::u16string_view path);

/// `path` in the form in which the standard file streams open it: its UTF-8 bytes. Throws
/// std::runtime_error when it is not valid UTF-16 or holds a zero, at which the system would cut
/// it.
std::string make_native_access_form_with_cleanup(std::u16string_view path);

}  // namespace platform::filesystem
