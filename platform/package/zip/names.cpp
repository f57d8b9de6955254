// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/names.h"

#include <cstddef>

namespace platform::package::zip {
namespace {

// The upper half of code page 437. The lower one is ASCII.
constexpr std::u16string_view upperHalf =
    u"\u00C7\u00FC\u00E9\u00E2\u00E4\u00E0\u00E5\u00E7"
    u"\u00EA\u00EB\u00E8\u00EF\u00EE\u00EC\u00C4\u00C5"
    u"\u00C9\u00E6\u00C6\u00F4\u00F6\u00F2\u00FB\u00F9"
    u"\u00FF\u00D6\u00DC\u00A2\u00A3\u00A5\u20A7\u0192"
    u"\u00E1\u00ED\u00F3\u00FA\u00F1\u00D1\u00AA\u00BA"
    u"\u00BF\u2310\u00AC\u00BD\u00BC\u00A1\u00AB\u00BB"
    u"\u2591\u2592\u2593\u2502\u2524\u2561\u2562\u2556"
    u"\u2555\u2563\u2551\u2557\u255D\u255C\u255B\u2510"
    u"\u2514\u2534\u252C\u251C\u2500\u253C\u255E\u255F"
    u"\u255A\u2554\u2569\u2566\u2560\u2550\u256C\u2567"
    u"\u2568\u2564\u2565\u2559\u2558\u2552\u2553\u256B"
    u"\u256A\u2518\u250C\u2588\u2584\u258C\u2590\u2580"
    u"\u03B1\u00DF\u0393\u03C0\u03A3\u03C3\u03BC\u03C4"
    u"\u03A6\u0398\u03A9\u03B4\u221E\u03C6\u03B5\u2229"
    u"\u2261\u00B1\u2265\u2264\u2320\u2321\u00F7\u2248"
    u"\u00B0\u2219\u00B7\u221A\u207F\u00B2\u25A0\u00A0";
static_assert(upperHalf.size() == 128);

bool isAscii(char c) {
    return static_cast<unsigned char>(c) < 0x80;
}

// The length of the sequence that begins with `lead`, and what its second byte may be: overlong
// forms, surrogates and what is beyond U+10FFFF differ from valid ones in that. 0 for no lead.
struct Sequence {
    std::size_t length = 0;
    unsigned char secondMin = 0x80;
    unsigned char secondMax = 0xBF;
};

Sequence sequenceOf(unsigned char lead) {
    if (lead < 0x80) {
        return {1};
    }
    if (lead >= 0xC2 && lead <= 0xDF) {
        return {2};
    }
    if (lead >= 0xE0 && lead <= 0xEF) {
        const unsigned char min = lead == 0xE0 ? 0xA0 : 0x80;
        const unsigned char max = lead == 0xED ? 0x9F : 0xBF;
        return {3, min, max};
    }
    if (lead >= 0xF0 && lead <= 0xF4) {
        const unsigned char min = lead == 0xF0 ? 0x90 : 0x80;
        const unsigned char max = lead == 0xF4 ? 0x8F : 0xBF;
        return {4, min, max};
    }
    return {};
}

}  // namespace

bool isUtf8(std::string_view bytes) noexcept {
    const auto at = [&](std::size_t i) { return static_cast<unsigned char>(bytes[i]); };
    for (std::size_t i = 0; i < bytes.size();) {
        const Sequence sequence = sequenceOf(at(i));
        if (sequence.length == 0 || bytes.size() - i < sequence.length) {
            return false;
        }
        if (sequence.length > 1 &&
            (at(i + 1) < sequence.secondMin || at(i + 1) > sequence.secondMax)) {
            return false;
        }
        for (std::size_t k = 2; k < sequence.length; ++k) {
            if ((at(i + k) & 0xC0U) != 0x80) {
                return false;
            }
        }
        i += sequence.length;
    }
    return true;
}

std::string fromCodePage437(std::string_view bytes) {
    std::string text;
    for (const char byte : bytes) {
        if (isAscii(byte)) {
            text += byte;
            continue;
        }
        const char16_t c = upperHalf[static_cast<unsigned char>(byte) - 0x80U];
        if (c >= 0x800) {
            text += static_cast<char>(0xE0U | c >> 12U);
            text += static_cast<char>(0x80U | (c >> 6U & 0x3FU));
        } else {
            text += static_cast<char>(0xC0U | c >> 6U);
        }
        text += static_cast<char>(0x80U | (c & 0x3FU));
    }
    return text;
}

std::string printable(std::string_view name) {
    constexpr std::string_view replacementCharacter = "\xEF\xBF\xBD";
    if (isUtf8(name)) {
        return std::string(name);
    }
    std::string result;
    for (const char c : name) {
        result.append(isAscii(c) ? std::string_view(&c, 1) : replacementCharacter);
    }
    return result;
}

}  // namespace platform::package::zip
