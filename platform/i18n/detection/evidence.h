// SPDX-License-Identifier: Apache-2.0
// What the charset of a file is detected from.
#pragma once

#include <bitset>
#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// Which of the 256 byte values a text holds.
using ByteSet = std::bitset<256>;

struct Evidence {
    /// Collects it from the bytes of a file. Linear in their number.
    explicit Evidence(std::string_view file);

    /// The whole file, which must outlive the evidence.
    std::string_view bytes;
    /// Which values occur in it.
    ByteSet values;
    /// The charset that it names, in lower case; empty where it names none.
    std::string declared;
    /// What the costs are computed of: all of a small file, and of a large one pieces from all over
    /// it that hold bytes beyond ASCII, cut where no character is cut in any charset.
    std::string sample;
};

}  // namespace platform::i18n::detail
