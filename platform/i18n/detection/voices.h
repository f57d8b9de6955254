// SPDX-License-Identifier: Apache-2.0
// What other detectors say.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace platform::i18n::detail {

/// The name by which the converters know what uchardet calls `name`; empty when they do not know
/// it, and for uchardet's "ASCII" and "", which say nothing.
std::string charsetOfUchardet(std::string_view name);

/// What uchardet takes `bytes` for, as a name that the converters know; empty when it cannot tell.
std::string uchardetGuess(std::string_view bytes);

/// What ICU takes `bytes` for, likeliest first, as it spells the names.
std::vector<std::string> icuGuesses(std::string_view bytes);

}  // namespace platform::i18n::detail
