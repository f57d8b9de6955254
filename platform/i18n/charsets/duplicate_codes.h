// SPDX-License-Identifier: Apache-2.0
// East Asian charsets in which some characters have two codes.
#pragma once

#include <memory>
#include <string_view>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Opens a variant of Shift_JIS, EUC-JP or Big5 that decodes as that charset does, and encodes
/// characters with two codes with the one which the charset itself does not use. Null when `name`
/// is none of
///   x-Shift_JIS-nec    NEC's codes rather than JIS's and IBM's
///   x-Shift_JIS-ibm    IBM's codes rather than NEC's
///   x-EUC-JP-nec       NEC's codes rather than JIS's
///   x-Big5-eten        the codes of the box drawing characters that are not Microsoft's
/// These names are ours: a text that was written with such codes is saved with them.
std::unique_ptr<Charset> makeDuplicateCodesVariant(std::string_view name, bool strict);

}  // namespace platform::i18n::detail
