// SPDX-License-Identifier: Apache-2.0
// Which charset a name means, and what converts it.
//
// A name is looked up in the table below, then among ICU's names. The converter that ICU finds is
// looked up in the table again, so that a row applies to all aliases of that converter. A converter
// without a row is used as it is.
//
// ICU often has several converters for one name. The one that IANA means is taken, else MIME's,
// else ICU's.
#include <unicode/ucnv.h>

#include <algorithm>
#include <optional>
#include <utility>

#include "platform/i18n/charsets/canonical_charset.h"
#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/charsets/code_variants.h"
#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/charsets/hz.h"
#include "platform/i18n/charsets/icu_charset.h"
#include "platform/i18n/charsets/johab.h"
#include "platform/i18n/charsets/shift_jis.h"
#include "platform/i18n/charsets/single_byte_charsets.h"
#include "platform/i18n/charsets/unicode_charsets.h"
#include "platform/i18n/charsets/utf7.h"

namespace platform::i18n::detail {

namespace {

// Opens a charset; `name` is used in error texts.
using Maker = std::unique_ptr<Charset> (*)(std::string name, bool strict);

struct Row {
    const char* name;                 // compared without case and punctuation
    Maker make;                       // null where ICU's converter is used as it is
    const char* converter = nullptr;  // which one that is
};

template <ByteOrder order>
std::unique_ptr<Charset> utf16(std::string name, bool strict) {
    return makeUtf16(std::move(name), order, strict);
}

template <ByteOrder order>
std::unique_ptr<Charset> utf32(std::string name, bool strict) {
    return makeUtf32(std::move(name), order, strict);
}

std::unique_ptr<Charset> refused(std::string, bool) {
    return nullptr;
}

std::unique_ptr<Charset> eucJp(std::string name, bool strict) {
    return makeIcuCharset(std::move(name), "euc-jp-2007", strict, u"\u00A2\u00A3\u00A6\u00AC");
}

std::unique_ptr<Charset> eucTw(std::string name, bool strict) {
    return makeIcuCharset(std::move(name), "euc-tw-2014", strict, u"\uFF5C");
}

std::unique_ptr<Charset> ibm1250(std::string name, bool strict) {
    return makeIcuCharset(std::move(name), "ibm-1250_P100-1995", strict, u"\u0080");
}

constexpr Row table[] = {
    {"UTF-8", makeUtf8},
    {"UTF-7", makeUtf7},
    // ICU's variants of these differ only in what they do with byte-order marks and in the byte
    // order of the machine; neither is wanted.
    {"UTF-16", utf16<ByteOrder::fromMark>},
    {"UTF-16,version=1", utf16<ByteOrder::fromMark>},
    {"UTF-16,version=2", utf16<ByteOrder::fromMark>},
    {"UTF16_PlatformEndian", utf16<ByteOrder::fromMark>},
    {"UTF16_OppositeEndian", utf16<ByteOrder::fromMark>},
    {"UTF-16BE", utf16<ByteOrder::big>},
    {"UTF-16BE,version=1", utf16<ByteOrder::big>},
    {"UTF-16LE", utf16<ByteOrder::little>},
    {"UTF-16LE,version=1", utf16<ByteOrder::little>},
    {"UTF-32", utf32<ByteOrder::fromMark>},
    {"UTF32_PlatformEndian", utf32<ByteOrder::fromMark>},
    {"UTF32_OppositeEndian", utf32<ByteOrder::fromMark>},
    {"UTF-32BE", utf32<ByteOrder::big>},
    {"UTF-32LE", utf32<ByteOrder::little>},

    // Charsets that ICU lacks, or loses bytes in.
    {"HZ", makeHz},
    {"ISO-8859-16", makeIso8859_16},
    {"latin10", makeIso8859_16},
    {"VISCII", makeViscii},
    {"csVISCII", makeViscii},
    {"KZ-1048", makeKz1048},
    {"STRK1048-2002", makeKz1048},
    {"RK1048", makeKz1048},
    {"PTCP154", makePtcp154},
    {"PT154", makePtcp154},
    {"CP154", makePtcp154},
    {"Johab", makeJohab},
    {"x-Johab", makeJohab},
    {"cp1361", makeJohab},
    {"ms1361", makeJohab},
    {"BOCU-1", makeBocu1},
    {"gsm-03.38-2009", makeGsm0338},

    // ICU's tables with characters that are decoded and cannot be encoded.
    {"euc-jp-2007", eucJp},
    {"euc-tw-2014", eucTw},
    {"ibm-1250_P100-1995", ibm1250},

    // Our own names, for texts with the other code of characters that have two.
    {"x-Shift_JIS-nec", makeShiftJisNec},
    {"x-Shift_JIS-ibm", makeShiftJisIbm},
    {"x-EUC-JP-nec", makeEucJpNec},
    {"x-Big5-eten", makeBig5Eten},

    // Usual names which ICU lacks, or maps to another table than everyone else does.
    {"UHC", nullptr, "windows-949-2000"},
    {"cp949", nullptr, "windows-949-2000"},
    {"cp950", nullptr, "windows-950-2000"},
    {"cp874", nullptr, "windows-874-2000"},

    // Where the web has long used a name for a superset of what IANA registered, the superset:
    // pages that call themselves EUC-KR, GB2312 and TIS-620 are full of characters which those
    // standards lack.
    {"ibm-970_P110_P110-2006_U2", nullptr, "windows-949-2000"},  // EUC-KR
    {"ibm-1363_P11B-1998", nullptr, "windows-949-2000"},         // KS_C_5601-1987
    {"ibm-1383_P110-1999", nullptr, "windows-936-2000"},         // GB2312
    {"ibm-874_P100-1995", nullptr, "windows-874-2000"},          // TIS-620

    // ICU 72 crashes when it encodes to this one.
    {"x11-compound-text", refused},
};

const Row* rowOf(const char* name) {
    const auto* const found = std::find_if(std::begin(table), std::end(table), [&](const Row& row) {
        return ucnv_compareNames(row.name, name) == 0;
    });
    return found == std::end(table) ? nullptr : found;
}

// Whether `name` could be the name of a charset: short, and visible ASCII without a comma, after
// which ICU would look for options.
bool isPlausibleName(std::string_view name) {
    return !name.empty() && name.size() <= UCNV_MAX_CONVERTER_NAME_LENGTH &&
           std::all_of(name.begin(), name.end(),
                       [](char c) { return c > ' ' && c <= '~' && c != UCNV_OPTION_SEP_CHAR; });
}

// ICU's converter for the charset `name`; null when it lists none. Only names that it lists are
// found, so that ICU does not look for a file of that name.
const char* icuConverter(const char* name) {
    for (const char* standard : {"IANA", "MIME"}) {
        UErrorCode error = U_ZERO_ERROR;
        if (const char* const converter = ucnv_getCanonicalName(name, standard, &error)) {
            return converter;
        }
    }
    UErrorCode error = U_ZERO_ERROR;
    return ucnv_getAlias(name, 0, &error);
}

// The row that `name` means; for a converter of ICU's that has none, one is made up.
std::optional<Row> resolve(std::string_view name) {
    if (!isPlausibleName(name)) {
        return std::nullopt;
    }
    const std::string wanted(name);
    if (const Row* row = rowOf(wanted.c_str())) {
        return *row;
    }
    const char* const converter = icuConverter(wanted.c_str());
    if (converter == nullptr) {
        return std::nullopt;
    }
    const Row* row = rowOf(converter);
    return row == nullptr ? Row{converter, nullptr, converter} : *row;
}

}  // namespace

std::unique_ptr<Charset> openCharset(std::string_view name, bool strict) {
    if (name == "UTF-8") {
        // Every path, name and key is in UTF-8, and looking up the charset takes longer than
        // converting most of them.
        return makeUtf8("UTF-8", strict);
    }
    std::unique_ptr<Charset> charset;
    if (const std::optional<Row> row = resolve(name)) {
        charset = row->make == nullptr ? makeIcuCharset(std::string(name), row->converter, strict)
                                       : row->make(std::string(name), strict);
    }
    if (!charset) {
        throwUnknownCharset(name);
    }
    return charset;
}

bool isSameCharset(std::string_view name, std::string_view other) {
    const std::optional<Row> first = resolve(name);
    const std::optional<Row> second = resolve(other);
    if (!first || !second || first->make != second->make) {
        return false;
    }
    return first->make != nullptr || std::string_view(first->converter) == second->converter;
}

}  // namespace platform::i18n::detail
