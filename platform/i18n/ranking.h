// The order in which legacy charsets come into question for a file.
#pragma once

#include <string_view>
#include <vector>

#include "platform/i18n/candidates.h"

namespace platform::i18n::detail {

/// The candidates in which the file that `sample` was taken from may be, likeliest first. `head` is
/// the beginning of the file, where it may name its charset.
std::vector<const Candidate*> rankedCandidates(std::string_view sample, std::string_view head);

}  // namespace platform::i18n::detail
