// SPDX-License-Identifier: Apache-2.0
// Charsets in which a text has one right spelling, although ICU's converters accept others too.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Open these charsets so that strict decoding refuses bytes which their text does not encode to;
/// `name` is used in error texts.
std::unique_ptr<Charset> makeBocu1(std::string name, bool strict);
std::unique_ptr<Charset> makeGsm0338(std::string name, bool strict);

}  // namespace platform::i18n::detail
