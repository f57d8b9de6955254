// SPDX-License-Identifier: Apache-2.0
// Conversions as their tests write them.
#pragma once

#include <gmock/gmock.h>

#include <stdexcept>
#include <string>
#include <string_view>

#include "platform/i18n/codecvt.h"

namespace platform::i18n {

inline std::u16string decode(const std::string& charset, std::string_view bytes,
                             bool strict = true) {
    codecvt_string_to_ustring converter(charset, strict);
    return converter.do_convert(bytes.data(), bytes.size());
}

inline std::string encode(const std::string& charset, std::u16string_view text,
                          bool strict = true) {
    codecvt_ustring_to_string converter(charset, strict);
    return converter.do_convert(text.data(), text.size());
}

/// Matches what throws std::runtime_error with a text that ends like this.
inline auto failsWith(const std::string& end) {
    return testing::ThrowsMessage<std::runtime_error>(testing::EndsWith(end));
}

}  // namespace platform::i18n
