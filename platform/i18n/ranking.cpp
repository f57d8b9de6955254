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
constexpr double uchardetDiscount = 4;
constexpr double icuDiscount = 2;

struct Ranked {
    const Candidate* candidate;
    double cost;
};

bool isSameCharset(const std::optional<std::string>& converter, const Candidate& candidate) {
    return converter && converter == converterName(candidate.charset());
}

class Discounts {
public:
    Discounts(std::string_view sample, std::string_view head)
        : declared_(converterName(declaredCharset(head))),
          uchardet_(converterName(uchardetGuess(sample))) {
        const std::vector<std::string> guesses = icuGuesses(sample);
        if (!guesses.empty()) {
            icu_ = converterName(guesses.front());
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
    std::optional<std::string> declared_;
    std::optional<std::string> uchardet_;
    std::optional<std::string> icu_;
};

}  // namespace

std::vector<const Candidate*> rankedCandidates(std::string_view sample, std::string_view head) {
    const Discounts discounts(sample, head);
    std::vector<Ranked> ranking;
    for (const Candidate& candidate : legacyCandidates()) {
        if (const std::optional<std::u16string> text = candidate.decode(sample)) {
            const double cost = costInBits(*text, candidate.languages());
            ranking.push_back({&candidate, cost + candidate.rarity() - discounts(candidate)});
        }
    }
    std::stable_sort(ranking.begin(), ranking.end(),
                     [](const Ranked& a, const Ranked& b) { return a.cost < b.cost; });
    std::vector<const Candidate*> candidates;
    for (const Ranked& ranked : ranking) {
        candidates.push_back(ranked.candidate);
    }
    return candidates;
}

}  // namespace platform::i18n::detail
