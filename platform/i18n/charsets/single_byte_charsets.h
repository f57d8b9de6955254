// SPDX-License-Identifier: Apache-2.0
// Charsets of single bytes that ICU lacks.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Open these charsets; `name` is used in error texts.
std::unique_ptr<Charset> makeIso8859_16(std::string name, bool strict);
std::unique_ptr<Charset> makeViscii(std::string name, bool strict);
std::unique_ptr<Charset> makeKz1048(std::string name, bool strict);
std::unique_ptr<Charset> makePtcp154(std::string name, bool strict);

}  // namespace platform::i18n::detail
