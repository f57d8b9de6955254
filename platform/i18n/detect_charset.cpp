// SPDX-License-Identifier: Apache-2.0
// Detection of the charset of a text file.
//
// In this order: a byte-order mark; ASCII, charsets of escape sequences, UTF-8, UTF-16 and UTF-32
// without a mark, and EBCDIC that is ASCII by its bytes; the legacy charsets, by the text's cost in
// each (detection/likeliest_charset.cpp). The result decodes the whole file and, but for escape
// sequences that no converter writes, encodes it back to the same bytes.
#include "platform/i18n/detect_charset.h"

#include <simdjson.h>
#include <unicode/utf8.h>

#include <array>
#include <cstdint>
#include <optional>
#include <ostream>
#include <stdexcept>
#include <string>
#include <vector>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/codecvt.h"
#include "platform/i18n/detection/escape_sequences.h"
#include "platform/i18n/detection/evidence.h"
#include "platform/i18n/detection/likeliest_charset.h"
#include "platform/i18n/detection/text_counts.h"
#include "platform/i18n/detection/unmarked_unicode.h"

namespace platform::i18n {

namespace {

constexpr const char* lastResort = "ISO-8859-1";

struct Mark {
    std::string_view bytes;
    const char* charset;
};

// UTF-32's little-endian mark begins with UTF-16's, so it comes first.
constexpr std::array<Mark, 5> marks{{
    {{"\xEF\xBB\xBF", 3}, "UTF-8"},
    {{"\xFF\xFE\0\0", 4}, "UTF-32LE"},
    {{"\0\0\xFE\xFF", 4}, "UTF-32BE"},
    {{"\xFF\xFE", 2}, "UTF-16LE"},
    {{"\xFE\xFF", 2}, "UTF-16BE"},
}};

bool decodesStrictly(const char* charset, std::string_view bytes) {
    try {
        const std::unique_ptr<detail::Charset> opened = detail::openCharset(charset, true);
        if (!opened->roundTrips(bytes)) {
            opened->decode(bytes);
        }
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

std::string markedCharset(std::string_view bytes) {
    for (const Mark& mark : marks) {
        if (bytes.starts_with(mark.bytes) && decodesStrictly(mark.charset, bytes)) {
            return mark.charset;
        }
    }
    return {};
}

// What is asked of the bytes of every file. Large files come from memory for each pass over them,
// so it is asked in one.
struct Survey {
    bool isAscii;
    bool hasStrayControls;
    bool mayHaveEscapes;
};

Survey surveyOf(std::string_view bytes) {
    // Without an early exit, so that the compiler vectorizes the loop: many times faster.
    unsigned char all = 0;
    unsigned char controls = 0;
    unsigned char escapes = 0;
    for (const char byte : bytes) {
        all |= static_cast<unsigned char>(byte);
        controls |= static_cast<unsigned char>(detail::isStrayControl(byte));
        escapes |= static_cast<unsigned char>(detail::mayBeginEscape(byte));
    }
    return {all < 0x80, controls != 0, escapes != 0};
}

// Whether so much of the sample is control codes that it is not text in any legacy charset.
bool isBinary(std::string_view sample) {
    // Counted in bytes, block by block, so that the compiler vectorizes the loop.
    constexpr std::size_t blockSize = 255;
    std::size_t controls = 0;
    for (std::size_t begin = 0; begin < sample.size(); begin += blockSize) {
        std::uint8_t found = 0;
        for (const char c : sample.substr(begin, blockSize)) {
            found = static_cast<std::uint8_t>(found + (detail::isStrayControl(c) ? 1 : 0));
        }
        controls += found;
    }
    return controls * 20 > sample.size() + 20;
}

// Whether the sample is UTF-8 except for a few damaged places. Legacy charsets could decode it, but
// to nonsense.
bool isDamagedUtf8(std::string_view sample) {
    std::size_t characters = 0;
    std::size_t damaged = 0;
    const auto* const data = reinterpret_cast<const std::uint8_t*>(sample.data());
    const auto size = static_cast<std::int32_t>(sample.size());
    for (std::int32_t i = 0; i < size;) {
        UChar32 character = 0;
        U8_NEXT(data, i, size, character);
        characters += character >= 0x80 ? 1U : 0U;
        damaged += character < 0 ? 1U : 0U;
    }
    return characters >= 10 && characters >= 10 * damaged;
}

std::string legacyCharset(std::string_view bytes) {
    const detail::Evidence evidence(bytes);
    const std::string& sample = evidence.sample;
    const std::optional<detail::UnmarkedUnicode> unicode = detail::unmarkedUnicode(bytes);
    const std::string otherwise = unicode ? unicode->charset : "";
    if (isBinary(sample) || isDamagedUtf8(sample)) {
        return otherwise;
    }
    std::vector<const detail::LegacyCharset*> excluded;
    while (const auto likely = detail::likeliestCharset(evidence, excluded)) {
        if (unicode && unicode->bitsPerByte * static_cast<double>(sample.size()) <
                           static_cast<double>(likely->cost) / detail::bits(1)) {
            return otherwise;
        }
        const detail::LegacyCharset::Fit fit = likely->charset->fit(evidence);
        if (fit.decodes) {
            // When the right charset would not give the bytes back, no other one is right either.
            return fit.name == likely->charset->name()
                       ? detail::largestThatAgrees(*likely->charset, evidence).name()
                       : fit.name;
        }
        excluded.push_back(likely->charset);
    }
    return otherwise;
}

// The EBCDIC charset of a text that is ASCII by its bytes, as Hebrew without digits is; empty when
// the text costs less as ASCII. Real ASCII costs far more in EBCDIC: its digits and line ends are
// controls there, and p, r, s, u, v and w nothing.
std::string asciiLookingEbcdic(std::string_view bytes) {
    constexpr std::size_t headSize = 4096;
    // Nearly all text in ASCII has a blank near its beginning, and so costs next to nothing here.
    const std::string_view head = bytes.substr(0, headSize);
    if (head.find(' ') != std::string_view::npos || !detail::looksLikeEbcdic(head)) {
        return {};
    }
    const detail::Evidence evidence(bytes);
    const auto likely = detail::likeliestCharset(evidence, {});
    return likely && likely->charset->kind() == detail::CharsetKind::ebcdic
               ? likely->charset->fit(evidence).name
               : std::string();
}

std::string findCharset(std::string_view bytes) {
    if (std::string marked = markedCharset(bytes); !marked.empty()) {
        return marked;
    }
    const Survey survey = surveyOf(bytes);
    if (!survey.isAscii && !simdjson::validate_utf8(bytes.data(), bytes.size())) {
        return legacyCharset(bytes);
    }
    // Valid UTF-8, but so are the bytes of escape sequences, and some of UTF-16 and EBCDIC.
    if (survey.isAscii && survey.mayHaveEscapes) {
        if (std::string escaped = detail::escapedCharset(bytes); !escaped.empty()) {
            return escaped;
        }
    }
    if (survey.hasStrayControls &&
        (bytes.find('\0') != std::string_view::npos || isBinary(bytes))) {
        const std::optional<detail::UnmarkedUnicode> unicode = detail::unmarkedUnicode(bytes);
        return unicode ? unicode->charset : "UTF-8";
    }
    const std::string ebcdic = survey.isAscii ? asciiLookingEbcdic(bytes) : "";
    return ebcdic.empty() ? "UTF-8" : ebcdic;
}

}  // namespace

void requireTextLength(std::uintmax_t length) {
    if (length > maxTextLength) {
        throw std::runtime_error("The text is too large: " + std::to_string(length) +
                                 " bytes, at most " + std::to_string(maxTextLength) +
                                 " are accepted");
    }
}

bool hasEscapeSequences(std::string_view charset) {
    return detail::isEscapedCharset(charset);
}

std::string detect_charset(const char* data, std::size_t length, std::ostream& diagnostics,
                           std::u16string_view sourceName) {
    requireTextLength(length);
    std::string charset = findCharset({data, length});
    if (!charset.empty()) {
        return charset;
    }
    codecvt_ustring_to_string toUtf8("UTF-8", false);
    diagnostics << "No known charset fits " << to_string(sourceName, toUtf8) << "; taken as "
                << lastResort << '\n';
    return lastResort;
}

}  // namespace platform::i18n
