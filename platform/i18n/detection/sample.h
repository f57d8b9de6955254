// SPDX-License-Identifier: Apache-2.0
// Takes a sample of a file that is enough to detect its charset.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// The bytes that detection examines: all of a small file, and of a large one pieces from all over
/// it that hold bytes beyond ASCII, cut where no character is cut in any charset. Linear in the
/// size.
std::string charsetSample(std::string_view bytes);

}  // namespace platform::i18n::detail
