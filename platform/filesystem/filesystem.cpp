// SPDX-License-Identifier: Apache-2.0
// Asks the file system about UTF-16 paths.
#include "platform/filesystem/filesystem.h"

#include <limits.h>

#include <filesystem>
#include <stdexcept>
#include <system_error>

#include "platform/i18n/codecvt.h"

namespace platform::filesystem {

bool exists(std::u16string_view path) {
    // A std::filesystem::path takes some fifty bytes for each of its characters.
    if (path.size() >= PATH_MAX) {
        throw std::filesystem::filesystem_error(
            "cannot look for a path of " + std::to_string(path.size()) + " characters",
            std::make_error_code(std::errc::filename_too_long));
    }
    return std::filesystem::exists(make_native_access_form_with_cleanup(path));
}

std::string make_native_access_form_with_cleanup(std::u16string_view path) {
    const auto zero = path.find(u'\0');
    if (zero != std::u16string_view::npos) {
        throw std::runtime_error("Invalid path: it holds a zero at code unit " +
                                 std::to_string(zero));
    }
    return i18n::to_string(path);
}

}  // namespace platform::filesystem
