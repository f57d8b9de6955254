// SPDX-License-Identifier: Apache-2.0
// Johab, the Korean charset of DOS that composes syllables from letters.
//
// A syllable is two bytes, the bits of which are
//
//     1 iiiii mmmmm fffff      initial, medial and final letter
//
// each in an order with gaps and with a code for "none". Symbols and ideographs are the rows of KS
// X 1001, two rows to a lead byte: D9 to DE have rows 21 to 2C, E0 to F9 have rows 4A to 7D. Trail
// bytes are 31 to 7E and 91 to FE. ASCII is itself.
#include "platform/i18n/charsets/johab.h"

#include <algorithm>
#include <array>
#include <initializer_list>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/charsets/row_table.h"

namespace platform::i18n::detail {

namespace {

constexpr int invalid = -2;
constexpr int none = -1;

// What the five bits stand for: the number of a letter, as Unicode orders them, or `none`.
using LetterCodes = std::array<int, 32>;

// `runs` are the first codes and lengths of the stretches in which the letters follow each other.
constexpr LetterCodes letterCodes(int noneCode, std::initializer_list<std::pair<int, int>> runs) {
    LetterCodes codes{};
    codes.fill(invalid);
    codes[static_cast<std::size_t>(noneCode)] = none;
    int letter = 0;
    for (const auto& [first, length] : runs) {
        for (int i = 0; i < length; ++i) {
            codes.at(static_cast<std::size_t>(first) + static_cast<std::size_t>(i)) = letter++;
        }
    }
    return codes;
}

constexpr LetterCodes initials = letterCodes(1, {{2, 19}});
constexpr LetterCodes medials = letterCodes(2, {{3, 5}, {10, 6}, {18, 6}, {26, 4}});
constexpr LetterCodes finals = letterCodes(1, {{2, 16}, {19, 11}});

// The letters by themselves, from U+3131 on: initials and finals share one order.
constexpr std::u16string_view initialLetters =
    u"\u3131\u3132\u3134\u3137\u3138\u3139\u3141\u3142\u3143\u3145\u3146\u3147\u3148\u3149\u314A"
    u"\u314B"
    u"\u314C\u314D\u314E";
constexpr std::u16string_view finalLetters =
    u"\u3131\u3132\u3133\u3134\u3135\u3136\u3137\u3139\u313A\u313B\u313C\u313D\u313E\u313F\u3140"
    u"\u3141"
    u"\u3142\u3144\u3145\u3146\u3147\u3148\u314A\u314B\u314C\u314D\u314E";
constexpr char16_t firstMedialLetter = 0x314F;
constexpr char16_t firstSyllable = 0xAC00;
constexpr char16_t lastSyllable = 0xD7A3;

int codeOf(const LetterCodes& codes, int letter) {
    return static_cast<int>(std::find(codes.begin(), codes.end(), letter) - codes.begin());
}

std::string codeOf(int initial, int medial, int final) {
    const int code = 0x8000 | codeOf(initials, initial) << 10 | codeOf(medials, medial) << 5 |
                     codeOf(finals, final);
    return {static_cast<char>(code >> 8), static_cast<char>(code & 0xFF)};
}

// The syllable or letter with this code.
std::optional<char16_t> composed(unsigned code) {
    const int initial = initials[code >> 10 & 31];
    const int medial = medials[code >> 5 & 31];
    const int final = finals[code & 31];
    if (initial >= 0 && medial >= 0 && final >= none) {
        return static_cast<char16_t>(firstSyllable + (initial * 21 + medial) * 28 + final + 1);
    }
    if (initial >= 0 && medial == none && final == none) {
        return initialLetters[static_cast<std::size_t>(initial)];
    }
    if (initial == none && medial >= 0 && final == none) {
        return static_cast<char16_t>(firstMedialLetter + medial);
    }
    if (initial == none && medial == none && final >= 0) {
        // Letters that are initials, too, are written as initials.
        const char16_t letter = finalLetters[static_cast<std::size_t>(final)];
        return initialLetters.find(letter) == std::u16string_view::npos ? std::optional(letter)
                                                                        : std::nullopt;
    }
    return std::nullopt;
}

// The code of a syllable or letter; empty for any other character.
std::string composedCode(char16_t character) {
    if (character >= firstSyllable && character <= lastSyllable) {
        const int index = character - firstSyllable;
        return codeOf(index / 28 / 21, index / 28 % 21, index % 28 - 1);
    }
    if (character >= firstMedialLetter && character < firstMedialLetter + 21) {
        return codeOf(none, character - firstMedialLetter, none);
    }
    if (const auto i = initialLetters.find(character); i != std::u16string_view::npos) {
        return codeOf(static_cast<int>(i), none, none);
    }
    if (const auto i = finalLetters.find(character); i != std::u16string_view::npos) {
        return codeOf(none, none, static_cast<int>(i));
    }
    return {};
}

constexpr bool isTrail(unsigned byte) {
    return (byte >= 0x31 && byte <= 0x7E) || (byte >= 0x91 && byte <= 0xFE);
}

const RowTable& ksX1001() {
    static const RowTable table("EUC-KR");
    return table;
}

// The symbol or ideograph with this code.
std::optional<char16_t> rowCharacter(unsigned lead, unsigned trail) {
    const bool symbol = lead >= 0xD9 && lead <= 0xDE;
    if (!isTrail(trail) || (!symbol && (lead < 0xE0 || lead > 0xF9))) {
        return std::nullopt;
    }
    const unsigned cell = trail < 0x91 ? trail - 0x31 : trail - 0x43;
    const unsigned row = (symbol ? 0x21 + 2 * (lead - 0xD9) : 0x4A + 2 * (lead - 0xE0)) + cell / 94;
    return ksX1001().character(row, cell % 94 + 0x21);
}

// The other way; empty when the character is neither.
std::string rowCode(char16_t character) {
    const std::optional<RowTable::Place> place = ksX1001().place(character);
    if (!place) {
        return {};
    }
    const bool symbol = place->row >= 0x21 && place->row <= 0x2C;
    if (!symbol && (place->row < 0x4A || place->row > 0x7D)) {
        return {};
    }
    const unsigned first = symbol ? 0x21 : 0x4A;
    const unsigned lead = (symbol ? 0xD9U : 0xE0U) + (place->row - first) / 2;
    const unsigned cell = (place->row - first) % 2 * 94 + place->column - 0x21;
    return {static_cast<char>(lead), static_cast<char>(cell < 78 ? cell + 0x31 : cell + 0x43)};
}

class Johab final : public Charset {
public:
    Johab(std::string name, bool strict) : name_(std::move(name)), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        std::u16string text;
        text.reserve(bytes.size());
        for (std::size_t i = 0; i < bytes.size();) {
            const auto lead = static_cast<unsigned char>(bytes[i]);
            if (lead < 0x80) {
                text += lead;
                ++i;
            } else if (const auto character = decodePair(bytes.substr(i, 2))) {
                text += *character;
                i += 2;
            } else {
                if (strict_ && i + 1 == bytes.size()) {
                    throwTruncated(name_, i);
                }
                if (strict_) {
                    throwMalformed(name_, i);
                }
                text += u'\uFFFD';
                ++i;
            }
        }
        return text;
    }

    std::string encode(std::u16string_view text) override {
        std::string bytes;
        bytes.reserve(text.size() * 2);
        for (std::size_t i = 0; i < text.size(); ++i) {
            const std::string code = encodeOne(text[i]);
            if (!code.empty()) {
                bytes += code;
                continue;
            }
            if (strict_) {
                throwCannotEncode(name_, text, i);
            }
            bytes += '?';
            i += startsWithPair(text.substr(i)) ? 1 : 0;
        }
        return bytes;
    }

private:
    static std::optional<char16_t> decodePair(std::string_view pair) {
        if (pair.size() < 2) {
            return std::nullopt;
        }
        const auto lead = static_cast<unsigned char>(pair[0]);
        const auto trail = static_cast<unsigned char>(pair[1]);
        if (lead >= 0x84 && lead <= 0xD3) {
            return composed(static_cast<unsigned>(lead << 8 | trail));
        }
        return rowCharacter(lead, trail);
    }

    static std::string encodeOne(char16_t character) {
        if (character < 0x80) {
            return std::string(1, static_cast<char>(character));
        }
        const std::string code = composedCode(character);
        return code.empty() ? rowCode(character) : code;
    }

    std::string name_;
    bool strict_;
};

}  // namespace

std::unique_ptr<Charset> makeJohab(std::string name, bool strict) {
    return std::make_unique<Johab>(std::move(name), strict);
}

}  // namespace platform::i18n::detail
