// SPDX-License-Identifier: Apache-2.0
// Which of ICU's converters a charset name means.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// Whether `name` could be the name of a charset: short, and visible ASCII without a comma, behind
/// which ICU would look for options.
bool isPlausibleName(std::string_view name);

/// ICU's own name of the converter for the charset `name`, an IANA name or a usual alias in any
/// case; nothing when there is none. Only names that ICU lists are looked up: options behind a
/// comma and names of files are not reachable.
std::optional<std::string> converterName(std::string_view name);

}  // namespace platform::i18n::detail
