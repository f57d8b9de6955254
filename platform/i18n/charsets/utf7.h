// SPDX-License-Identifier: Apache-2.0
// UTF-7, Unicode in seven bits for mail.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens UTF-7 (RFC 2152); `name` is used in error texts. A text has many spellings: encoding
/// writes as many characters directly as the RFC allows, and ends every run of base64 with a "-"
/// where that is needed, and at the end of the text.
std::unique_ptr<Charset> makeUtf7(std::string name, bool strict);

}  // namespace platform::i18n::detail
