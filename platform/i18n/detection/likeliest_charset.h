// SPDX-License-Identifier: Apache-2.0
// Which legacy charset a text is most likely in.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/evidence.h"
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

/// The charset in which the sample costs least, of those that can decode it and, as far as its byte
/// values tell, the whole file; nothing when there is none but those in `excluded`. Linear in the
/// length of the sample.
std::optional<LikelyCharset> likeliestCharset(const Evidence& evidence,
                                              const std::vector<const LegacyCharset*>& excluded);

/// Of the charsets that are no rarer than `charset`, read every byte of the file as it does and
/// hold all its letters, the one that holds most characters, so that people can add some
/// (windows-1252 rather than ISO-8859-1); but `charset` itself when the file names it.
const LegacyCharset& largestThatAgrees(const LegacyCharset& charset, const Evidence& evidence);

}  // namespace platform::i18n::detail
