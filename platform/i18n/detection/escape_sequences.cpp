// SPDX-License-Identifier: Apache-2.0
// Charsets that switch between ASCII and other characters by escape sequences. All their bytes are
// ASCII, so this has to be checked before a file counts as plain ASCII.
#include "platform/i18n/detection/escape_sequences.h"

#include <algorithm>
#include <span>
#include <stdexcept>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

namespace {

// The smaller charsets of a family first, as they are the more widely known.
constexpr const char* iso2022Charsets[] = {"ISO-2022-JP", "ISO-2022-JP-1", "ISO-2022-JP-2",
                                           "ISO-2022-KR", "ISO-2022-CN",   "ISO-2022-CN-EXT"};
constexpr const char* hzCharsets[] = {"HZ-GB-2312"};

enum class Reading { none, sameText, sameBytes };

// The bytes that result when `bytes` are read in `charset` and saved again. One text can be spelt
// with different escape sequences, and a converter writes one of these spellings.
Reading readingIn(const char* charset, std::string_view bytes) {
    try {
        const std::unique_ptr<Charset> opened = openCharset(charset, true);
        const std::u16string text = opened->decode(bytes);
        if (std::all_of(text.begin(), text.end(), [](char16_t c) { return c < 0x80; })) {
            return Reading::none;
        }
        const std::string saved = opened->encode(text);
        if (saved == bytes) {
            return Reading::sameBytes;
        }
        return opened->decode(saved) == text ? Reading::sameText : Reading::none;
    } catch (const std::runtime_error&) {
        return Reading::none;
    }
}

std::string bestOf(std::span<const char* const> charsets, std::string_view bytes) {
    std::string best;
    for (const char* charset : charsets) {
        const Reading reading = readingIn(charset, bytes);
        if (reading == Reading::sameBytes) {
            return charset;
        }
        if (reading == Reading::sameText && best.empty()) {
            best = charset;
        }
    }
    return best;
}

}  // namespace

std::string escapedCharset(std::string_view bytes) {
    if (bytes.find('\x1B') != std::string_view::npos) {
        return bestOf(iso2022Charsets, bytes);
    }
    return bytes.find("~{") != std::string_view::npos ? bestOf(hzCharsets, bytes) : std::string();
}

bool isEscapedCharset(std::string_view charset) {
    const auto holds = [charset](std::span<const char* const> charsets) {
        return std::find(charsets.begin(), charsets.end(), charset) != charsets.end();
    };
    return holds(iso2022Charsets) || holds(hzCharsets);
}

}  // namespace platform::i18n::detail
