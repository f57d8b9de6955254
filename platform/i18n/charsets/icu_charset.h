// SPDX-License-Identifier: Apache-2.0
// Charsets that ICU converts.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens ICU's converter `converter`; `name` is what error texts call the charset. Null when ICU
/// has no such converter.
std::unique_ptr<Charset> makeIcuCharset(std::string name, const std::string& converter,
                                        bool strict);

}  // namespace platform::i18n::detail
