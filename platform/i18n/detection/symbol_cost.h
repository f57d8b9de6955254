// SPDX-License-Identifier: Apache-2.0
// How unexpected signs that are no letters are in running text.
#pragma once

namespace platform::i18n::detail {

/// The character next to a sign, as far as it matters: '\0' for none.
struct Neighbours {
    char16_t before;
    char16_t after;
};

/// The bits that the non-ASCII sign `sign` costs where it stands.
int symbolCost(char16_t sign, Neighbours neighbours);

}  // namespace platform::i18n::detail
