// SPDX-License-Identifier: Apache-2.0
// Shift_JIS: everything that is special about it. The header explains it.
#include "platform/i18n/charsets/shift_jis.h"

#include "platform/i18n/charsets/code_variants.h"

namespace platform::i18n {

namespace {

template <typename Text>
void replaceFileSeparators(Text& text, const std::string& charset) {
    constexpr typename Text::value_type fileSeparator = 0x1C;
    constexpr typename Text::value_type endOfFileMark = 0x1A;
    if (charset != "Shift_JIS") {
        return;
    }
    // Hardly any text has one, and find() is the fastest way to tell.
    for (auto at = text.find(fileSeparator); at != Text::npos;
         at = text.find(fileSeparator, at + 1)) {
        text[at] = endOfFileMark;
    }
}

}  // namespace

void restoreEndOfFileMarks(std::u16string& text, const std::string& charset) {
    replaceFileSeparators(text, charset);
}

void restoreEndOfFileMarks(std::string& bytes, const std::string& charset) {
    replaceFileSeparators(bytes, charset);
}

namespace detail {

std::unique_ptr<Charset> makeShiftJisNec(std::string, bool strict) {
    static const PreferredCodes codes =
        secondCodes("Shift_JIS", {{0x8790, 0x879C}, {0xED40, 0xEEFC}});
    return makeCodeVariant("Shift_JIS", codes, strict);
}

std::unique_ptr<Charset> makeShiftJisIbm(std::string, bool strict) {
    static const PreferredCodes codes = secondCodes("Shift_JIS", {{0xFA4A, 0xFA5B}});
    return makeCodeVariant("Shift_JIS", codes, strict);
}

}  // namespace detail

}  // namespace platform::i18n
