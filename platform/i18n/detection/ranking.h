// SPDX-License-Identifier: Apache-2.0
// The order in which legacy charsets come into question for a file.
#pragma once

#include <memory>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/candidates.h"
#include "platform/i18n/detection/plausibility.h"

namespace platform::i18n::detail {

/// The candidates in which a sample decodes, likeliest first. Each is looked at only as far as it
/// takes to see that another one is likelier.
class Ranking {
public:
    /// `head` is the beginning of the file that the sample is of, where it may name its charset.
    /// Both must stay while the ranking is used.
    Ranking(std::string_view sample, std::string_view head);
    ~Ranking();

    /// The next candidate; null after the last.
    const Candidate* next();

    /// The bits that the sample costs in the candidate that `next` returned last, discounts and
    /// rarity included.
    double cost();

private:
    class Entrant;
    class Voices;

    bool isClearlyFirst(const Entrant& first) const;

    std::string_view sample_;
    Surroundings surroundings_;
    std::unique_ptr<Voices> voices_;
    std::vector<Entrant> entrants_;  // those that have not been returned, in no order
    std::unique_ptr<Entrant> last_;
};

}  // namespace platform::i18n::detail
