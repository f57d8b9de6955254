// SPDX-License-Identifier: Apache-2.0
// Charsets that ICU converts.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens ICU's converter `converter`; `name` is used in error texts. `oneWay` are the characters
/// that the converter decodes but cannot encode; it must remain live while the charset is in use.
/// Null when ICU has no such converter.
std::unique_ptr<Charset> makeIcuCharset(std::string name, const char* converter, bool strict,
                                        std::u16string_view oneWay = {});

}  // namespace platform::i18n::detail
