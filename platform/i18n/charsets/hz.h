// SPDX-License-Identifier: Apache-2.0
// HZ, Chinese in seven bits.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens HZ-GB-2312 (RFC 1843); `name` is used in error texts. Strict decoding refuses whatever
/// encoding would not give back byte for byte: what is malformed or cut off, and also line
/// continuations and shifts that change nothing.
std::unique_ptr<Charset> makeHz(std::string name, bool strict);

}  // namespace platform::i18n::detail
