// SPDX-License-Identifier: Apache-2.0
// East Asian charsets in which some characters have two codes: variants that prefer the other one.
#pragma once

#include <initializer_list>
#include <memory>
#include <string>
#include <unordered_map>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// Codes of two bytes, both ends included.
struct CodeRange {
    unsigned first;
    unsigned last;
};

/// Codes to prefer, by their characters.
using PreferredCodes = std::unordered_map<char16_t, std::string>;

/// The codes in `ranges` that the charset `base` decodes, but encodes otherwise.
PreferredCodes secondCodes(const char* base, std::initializer_list<CodeRange> ranges);

/// Opens a variant of `base` that decodes as that does, and encodes with the preferred codes, which
/// must remain live while it is in use.
std::unique_ptr<Charset> makeCodeVariant(const char* base, const PreferredCodes& preferred,
                                         bool strict);

/// Opens x-EUC-JP-nec: EUC-JP with NEC's codes rather than JIS's.
std::unique_ptr<Charset> makeEucJpNec(std::string name, bool strict);

/// Opens x-Big5-eten: Big5 with the codes of the box drawing characters that are not Microsoft's.
std::unique_ptr<Charset> makeBig5Eten(std::string name, bool strict);

}  // namespace platform::i18n::detail
