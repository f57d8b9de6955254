// SPDX-License-Identifier: Apache-2.0
// The charsets that text files without a mark are found in.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/plausibility.h"

namespace platform::i18n::detail {

/// A charset that a file may be in.
class Candidate {
public:
    Candidate(const char* charset, double rarity);

    /// Its IANA name, or the usual one where IANA has none.
    const std::string& charset() const { return charset_; }

    /// The bits that a file in this charset must save against one in the commonest, for it to be
    /// taken.
    double rarity() const { return rarity_; }

    /// The text of `bytes`; nothing when they are malformed.
    std::optional<std::u16string> decode(std::string_view bytes) const;

    /// How well the charset fits a whole file.
    struct Fit {
        /// Whether all the bytes decode strictly.
        bool decodes;
        /// The name under which they also encode back to the same bytes: the charset's own, or that
        /// of a variant which decodes to the same text. Empty when there is none.
        std::string charset;
    };
    Fit fit(std::string_view bytes) const;

    /// The languages that this charset was made for.
    const std::vector<const Language*>& languages() const { return languages_; }

private:
    void learnSingleBytes();

    std::string charset_;
    double rarity_;
    bool isSingleByte_ = false;
    // What each byte stands for, in charsets of single bytes; unusedByte where it stands for
    // nothing.
    std::u16string table_;
    std::vector<const Language*> languages_;
};

/// All candidates, likelier ones first. Made once, at the first call; lives as long as the program.
const std::vector<Candidate>& legacyCandidates();

}  // namespace platform::i18n::detail
