// SPDX-License-Identifier: Apache-2.0
// Base64 text as RFC 4648, section 4, defines it: the standard alphabet, with padding, on one line.
#pragma once

#include <string>
#include <string_view>

#include "platform/data_buffer.h"

namespace platform {

/// The base64 text of `bytes`, padded, without line breaks and without a terminating zero. No bytes
/// give a buffer without storage. Throws std::runtime_error "Out of memory!" when there is no
/// memory. Linear.
DataBuffer base64encode(const DataBuffer& bytes);

/// Appends the base64 text of `bytes` to `text`. Throws as above, and leaves `text` as it was.
void base64encode(std::string_view bytes, std::string& text);

/// The bytes that the base64 `text` stands for. ASCII white space is skipped wherever it stands,
/// and padding may be missing as a whole. Throws std::runtime_error naming the offset for
/// everything else that base64encode does not write: a character outside the alphabet, padding that
/// does not complete its group of four, anything after the padding, a single left-over character,
/// and left-over bits that are not zero (a sign that the text was cut or changed). Throws "Out of
/// memory!" as base64encode does. Linear.
DataBuffer base64decode(std::string_view text);

}  // namespace platform
