// SPDX-License-Identifier: Apache-2.0
// Johab, the Korean charset of DOS that composes syllables from letters; ICU lacks it.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens Johab (KS X 1001 annex 3); `name` is used in error texts.
std::unique_ptr<Charset> makeJohab(std::string name, bool strict);

}  // namespace platform::i18n::detail
