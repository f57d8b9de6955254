// SPDX-License-Identifier: Apache-2.0
// The order in which legacy charsets come into question for a file: by what its text costs in each,
// less a discount for what the file itself and other detectors say.
//
// The cost of a candidate can only grow as more of its text is looked at, so the one that is first
// is found like the shortest way on a map: the entrant that is cheapest so far is always the one
// that is taken further, until the cheapest is one whose text has been looked at to the end. Nearly
// all others have been given up early by then. Asking other detectors takes long too; they are
// asked only where the little that they can say may change the order.
#include "platform/i18n/detection/ranking.h"

#include <algorithm>
#include <iterator>
#include <optional>
#include <string>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/detection/declared_charset.h"
#include "platform/i18n/detection/voices.h"

namespace platform::i18n::detail {

namespace {

constexpr double declaredDiscount = 40;
constexpr double uchardetDiscount = 1;
constexpr double icuDiscount = 0.5;

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

// What the file itself and other detectors say, as discounts.
class Ranking::Voices {
public:
    Voices(std::string_view sample, std::string_view head)
        : sample_(sample), declared_(declaredCharset(head)) {}

    double declaredDiscountOf(const Candidate& candidate) const {
        return isSameCharset(declared_, candidate.charset()) ? declaredDiscount : 0;
    }

    // The discount for what other detectors say, who are asked when this is called first.
    double discountOf(const Candidate& candidate) {
        if (!asked_) {
            uchardet_ = uchardetGuess(sample_);
            const std::vector<std::string> guesses = icuGuesses(sample_);
            icu_ = guesses.empty() ? std::string() : guesses.front();
            asked_ = true;
        }
        return (isSameCharset(uchardet_, candidate.charset()) ? uchardetDiscount : 0) +
               (isSameCharset(icu_, candidate.charset()) ? icuDiscount : 0);
    }

private:
    std::string_view sample_;
    std::string declared_;
    bool asked_ = false;
    std::string uchardet_;
    std::string icu_;
};

// A candidate on its way through the sample.
class Ranking::Entrant {
public:
    Entrant(const Candidate& candidate, double discount)
        : candidate_(&candidate), discount_(discount) {}

    const Candidate& candidate() const { return *candidate_; }

    // What it costs at least, with all that other detectors may grant it or have granted.
    double bound() const { return bits_ + candidate_->rarity() - (discount_ + granted_); }

    // What it costs at most once it is whole.
    double costWithoutGrant() const { return bits_ + candidate_->rarity() - discount_; }

    bool isWhole() const { return text_ && text_->isWhole(); }
    bool isFinal() const { return isWhole() && isGranted_; }

    void grant(double discount) {
        granted_ = discount;
        isGranted_ = true;
    }

    // Goes a step further. False when the sample does not decode.
    bool advance(std::string_view sample, const Surroundings& surroundings) {
        constexpr std::size_t step = 2048;
        if (!text_) {
            auto decoded = decodeSample(*candidate_, sample);
            if (!decoded) {
                return false;
            }
            text_.emplace(std::move(*decoded), candidate_->languages(), surroundings);
        }
        text_->lookFurther(step);
        bits_ = text_->bits();
        return true;
    }

    // The order in which entrants are taken up: the cheapest so far; of those, first the ones that
    // may still become dearer, and then by the order of the candidates.
    bool isBefore(const Entrant& other) const {
        const double mine = bound();
        const double others = other.bound();
        if (mine != others) {
            return mine < others;
        }
        return isFinal() != other.isFinal() ? other.isFinal() : candidate_ < other.candidate_;
    }

private:
    const Candidate* candidate_;
    double discount_;
    double granted_ = uchardetDiscount + icuDiscount;
    bool isGranted_ = false;
    std::optional<TextCost> text_;
    double bits_ = 0;  // of as much of the text as has been looked at
};

Ranking::Ranking(std::string_view sample, std::string_view head)
    : sample_(sample), surroundings_(sample), voices_(std::make_unique<Voices>(sample, head)) {
    for (const Candidate& candidate : legacyCandidates()) {
        entrants_.emplace_back(candidate, voices_->declaredDiscountOf(candidate));
    }
}

Ranking::~Ranking() = default;

const Candidate* Ranking::next() {
    const auto isBefore = [](const Entrant& a, const Entrant& b) { return a.isBefore(b); };
    while (!entrants_.empty()) {
        const auto first = std::min_element(entrants_.begin(), entrants_.end(), isBefore);
        if (!first->isWhole()) {
            if (!first->advance(sample_, surroundings_)) {
                entrants_.erase(first);
            }
            continue;
        }
        if (!first->isFinal() && !isClearlyFirst(*first)) {
            first->grant(voices_->discountOf(first->candidate()));
            continue;
        }
        last_ = std::make_unique<Entrant>(std::move(*first));
        entrants_.erase(first);
        return &last_->candidate();
    }
    return nullptr;
}

// Whether no entrant can get before `first`, whatever other detectors say.
bool Ranking::isClearlyFirst(const Entrant& first) const {
    return std::all_of(entrants_.begin(), entrants_.end(), [&](const Entrant& other) {
        return &other == &first || first.costWithoutGrant() < other.bound();
    });
}

double Ranking::cost() {
    last_->grant(voices_->discountOf(last_->candidate()));
    return last_->bound();
}

}  // namespace platform::i18n::detail
