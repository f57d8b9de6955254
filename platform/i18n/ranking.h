// The order in which legacy charsets come into question for a file.
#pragma once

#include <string_view>
#include <vector>

#include "platform/i18n/candidates.h"

namespace platform::i18n::detail {

/// A candidate with the bits that a sample costs in it, discounts and rarity included.
struct RankedCandidate {
    const Candidate* candidate;
    double cost;
};

/// The candidates in which `sample` decodes, likeliest first. `head` is the beginning of the file
/// that the sample is of, where it may name its charset.
std::vector<RankedCandidate> rankedCandidates(std::string_view sample, std::string_view head);

}  // namespace platform::i18n::detail
