// SPDX-License-Identifier: Apache-2.0
// The encoding forms of Unicode: UTF-8, and UTF-16 and UTF-32 in either byte order.
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Where the byte order of UTF-16 and UTF-32 comes from. `fromMark` reads it from the byte-order
/// mark of the input, takes little-endian when there is none, and writes little-endian.
enum class ByteOrder { little, big, fromMark };

/// Each charset keeps a byte-order mark as the character U+FEFF, and adds none. `name` is used in
/// error texts.
std::unique_ptr<Charset> makeUtf8(std::string name, bool strict);
std::unique_ptr<Charset> makeUtf16(std::string name, ByteOrder order, bool strict);
std::unique_ptr<Charset> makeUtf32(std::string name, ByteOrder order, bool strict);

}  // namespace platform::i18n::detail
