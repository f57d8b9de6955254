// SPDX-License-Identifier: Apache-2.0
// Which legacy charset a text is most likely in.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/legacy_charsets.h"

namespace platform::i18n::detail {

/// A charset, and what the text costs in it, prior and hint included.
struct LikelyCharset {
    const LegacyCharset* charset;
    Cost cost;
};

/// Whether `sample` has the blanks of EBCDIC, where they are 40 and 20 is a control. Linear in its
/// length.
bool looksLikeEbcdic(std::string_view sample);

/// The charset in which `sample` costs least, of those that can decode it and, as far as its byte
/// values tell, the whole file `bytes` that it was taken from; nothing when there is none but those
/// in `excluded`. Linear in the length of the sample.
std::optional<LikelyCharset> likeliestCharset(std::string_view sample, std::string_view bytes,
                                              const std::vector<const LegacyCharset*>& excluded);

/// Of the charsets that are no rarer than `charset`, read every byte of `bytes` as it does and hold
/// all its letters, the one that holds most characters, so that people can add some (windows-1252
/// rather than ISO-8859-1); but `charset` itself when the text names it.
const LegacyCharset& largestThatAgrees(const LegacyCharset& charset, std::string_view bytes);

}  // namespace platform::i18n::detail
