// Detection of the charset of a text file.
//
// In this order: a byte-order mark; UTF-16 and UTF-32 without one; charsets of escape sequences;
// UTF-8; the legacy charsets, ranked by how plausible their text is. Whatever is returned decodes
// the whole file and encodes it back to the same bytes.
#include "platform/i18n/detect_charset.h"

#include <simdjson.h>

#include <algorithm>
#include <array>
#include <optional>
#include <ostream>
#include <stdexcept>
#include <vector>

#include "platform/i18n/charset.h"
#include "platform/i18n/codecvt.h"
#include "platform/i18n/escape_charsets.h"
#include "platform/i18n/ranking.h"
#include "platform/i18n/sample.h"
#include "platform/i18n/unicode_guess.h"

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
        detail::openCharset(charset, true)->decode(bytes);
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

bool isAscii(std::string_view bytes) {
    return std::all_of(bytes.begin(), bytes.end(),
                       [](char byte) { return static_cast<unsigned char>(byte) < 0x80; });
}

// Whether so much of the sample is control codes that it is no text in any legacy charset.
bool isBinary(std::string_view sample) {
    const auto controls = std::count_if(sample.begin(), sample.end(), [](char c) {
        const auto byte = static_cast<unsigned char>(c);
        return byte < 0x20 && !(byte >= '\t' && byte <= '\r') && byte != 0x1A && byte != 0x1B;
    });
    return static_cast<std::size_t>(controls) * 20 > sample.size();
}

std::string legacyCharset(std::string_view bytes) {
    const std::string sample = detail::charsetSample(bytes);
    const std::optional<detail::UnicodeGuess> unicode = detail::unmarkedUnicode(bytes);
    const auto ranking = isBinary(sample) ? std::vector<detail::RankedCandidate>()
                                          : detail::rankedCandidates(sample, bytes);
    if (unicode &&
        (ranking.empty() ||
         unicode->bitsPerByte < ranking.front().cost / static_cast<double>(sample.size()))) {
        return unicode->charset;
    }
    for (const detail::RankedCandidate& ranked : ranking) {
        if (ranked.candidate->holds(bytes)) {
            return ranked.candidate->charset();
        }
    }
    return {};
}

std::string findCharset(std::string_view bytes) {
    if (std::string marked = markedCharset(bytes); !marked.empty()) {
        return marked;
    }
    if (!simdjson::validate_utf8(bytes.data(), bytes.size())) {
        return legacyCharset(bytes);
    }
    // Valid UTF-8, but the bytes of ASCII text in UTF-16 and of escape sequences are that, too.
    if (bytes.find('\0') != std::string_view::npos) {
        const std::optional<detail::UnicodeGuess> unicode = detail::unmarkedUnicode(bytes);
        return unicode ? unicode->charset : "UTF-8";
    }
    const std::string escaped = isAscii(bytes) ? detail::escapedCharset(bytes) : std::string();
    return escaped.empty() ? "UTF-8" : escaped;
}

}  // namespace

std::string detect_charset(const char* data, std::size_t length, std::ostream& diagnostics,
                           std::u16string_view sourceName) {
    const std::string charset = findCharset({data, length});
    if (!charset.empty()) {
        return charset;
    }
    codecvt_ustring_to_string toUtf8("UTF-8", false);
    diagnostics << "No known charset fits " << to_string(sourceName, toUtf8) << "; taken as "
                << lastResort << '\n';
    return lastResort;
}

}  // namespace platform::i18n
