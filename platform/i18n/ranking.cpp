// The order in which legacy charsets come into question for a file: by what its text costs in each,
// less a discount for what the file itself and other detectors say.
#include "platform/i18n/ranking.h"

#include <algorithm>
#include <optional>
#include <string>

#include "platform/i18n/charset_names.h"
#include "platform/i18n/declared_charset.h"
#include "platform/i18n/voices.h"

namespace platform::i18n::detail {

namespace {

constexpr double declaredDiscount = 40;
constexpr double uchardetDiscount = 1;
constexpr double icuDiscount = 0.5;

bool isSameCharset(const std::string& name, const Candidate& candidate) {
    if (name.empty()) {
        return false;
    }
    const std::optional<std::string> converter = converterName(name);
    return name == candidate.charset() ||
           (converter && converter == converterName(candidate.charset()));
}

class Discounts {
public:
    Discounts(std::string_view sample, std::string_view head)
        : declared_(declaredCharset(head)), uchardet_(uchardetGuess(sample)) {
        const std::vector<std::string> guesses = icuGuesses(sample);
        if (!guesses.empty()) {
            icu_ = guesses.front();
        }
    }

    double operator()(const Candidate& candidate) const {
        double discount = 0;
        discount += isSameCharset(declared_, candidate) ? declaredDiscount : 0;
        discount += isSameCharset(uchardet_, candidate) ? uchardetDiscount : 0;
        discount += isSameCharset(icu_, candidate) ? icuDiscount : 0;
        return discount;
    }

private:
    std::string declared_;
    std::string uchardet_;
    std::string icu_;
};

// The text of the sample in `candidate`. A sample of a large file can end inside a character.
std::optional<std::u16string> decodeSample(const Candidate& candidate, std::string_view sample) {
    constexpr std::size_t longestCharacter = 4;
    for (std::size_t cut = 0; cut < longestCharacter && cut <= sample.size(); ++cut) {
        if (auto text = candidate.decode(sample.substr(0, sample.size() - cut))) {
            return text;
        }
    }
    return std::nullopt;
}

}  // namespace

std::vector<RankedCandidate> rankedCandidates(std::string_view sample, std::string_view head) {
    const Discounts discounts(sample, head);
    const Surroundings surroundings(sample);
    std::vector<RankedCandidate> ranking;
    for (const Candidate& candidate : legacyCandidates()) {
        if (const std::optional<std::u16string> text = decodeSample(candidate, sample)) {
            const double cost = costInBits(*text, candidate.languages(), surroundings);
            ranking.push_back({&candidate, cost + candidate.rarity() - discounts(candidate)});
        }
    }
    std::stable_sort(
        ranking.begin(), ranking.end(),
        [](const RankedCandidate& a, const RankedCandidate& b) { return a.cost < b.cost; });
    return ranking;
}

}  // namespace platform::i18n::detail
