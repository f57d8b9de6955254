// SPDX-License-Identifier: Apache-2.0
// A national standard of 94 rows of 94 characters, such as GB 2312 or KS X 1001.
#include "platform/i18n/charsets/row_table.h"

#include <stdexcept>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

namespace {

constexpr bool isPrivate(char16_t character) {
    return character >= 0xE000 && character < 0xF900;
}

// The one character with the code `code` when it encodes back to that; else nothing.
std::optional<char16_t> characterOf(Charset& euc, const std::string& code) {
    try {
        const std::u16string text = euc.decode(code);
        if (text.size() == 1 && !isPrivate(text.front()) && euc.encode(text) == code) {
            return text.front();
        }
    } catch (const std::runtime_error&) {
        // The place is empty.
    }
    return std::nullopt;
}

}  // namespace

RowTable::RowTable(const char* euc) : places_(0x10000) {
    const std::unique_ptr<Charset> charset = openCharset(euc, true);
    for (unsigned row = first; row <= last; ++row) {
        for (unsigned column = first; column <= last; ++column) {
            const std::string code{static_cast<char>(row | 0x80U),
                                   static_cast<char>(column | 0x80U)};
            if (const std::optional<char16_t> character = characterOf(*charset, code)) {
                characters_[(row - first) * size + column - first] = *character;
                places_[*character] = {static_cast<std::uint8_t>(row),
                                       static_cast<std::uint8_t>(column)};
            }
        }
    }
}

std::optional<char16_t> RowTable::character(unsigned row, unsigned column) const {
    if (row < first || row > last || column < first || column > last) {
        return std::nullopt;
    }
    const char16_t character = characters_[(row - first) * size + column - first];
    return character == 0 ? std::nullopt : std::optional(character);
}

std::optional<RowTable::Place> RowTable::place(char16_t character) const {
    const Place place = places_[character];
    return place.row == 0 ? std::nullopt : std::optional(place);
}

}  // namespace platform::i18n::detail
