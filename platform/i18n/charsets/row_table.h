// SPDX-License-Identifier: Apache-2.0
// A national standard of 94 rows of 94 characters, such as GB 2312 or KS X 1001.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

namespace platform::i18n::detail {

/// The characters of such a standard, by row and column, both 21 to 7E as in ISO 2022. Immutable
/// once made, so that threads may share it.
class RowTable {
public:
    /// The place of a character.
    struct Place {
        std::uint8_t row;
        std::uint8_t column;
    };

    /// Reads the table from the charset `euc`, in which both bytes of a character have their high
    /// bit set. Characters for private use and those that do not encode back are left out.
    explicit RowTable(const char* euc);

    /// The character in this place; nothing when there is none.
    std::optional<char16_t> character(unsigned row, unsigned column) const;

    /// The place of `character`; nothing when the standard lacks it.
    std::optional<Place> place(char16_t character) const;

private:
    static constexpr unsigned first = 0x21;
    static constexpr unsigned last = 0x7E;
    static constexpr std::size_t size = last - first + 1;

    std::array<char16_t, size * size> characters_{};
    std::vector<Place> places_;  // by character
};

}  // namespace platform::i18n::detail
