// SPDX-License-Identifier: Apache-2.0
// Charsets of single bytes that ICU lacks.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens the charset called `name`, in any case and with or without its hyphens; null when it is
/// none of these: ISO-8859-16, VISCII.
std::unique_ptr<Charset> makeTableCharset(std::string_view name, bool strict);

}  // namespace platform::i18n::detail
