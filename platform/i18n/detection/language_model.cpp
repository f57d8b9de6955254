// SPDX-License-Identifier: Apache-2.0
// What letters cost in each language.
#include "platform/i18n/detection/language_model.h"

#include <algorithm>
#include <cmath>

namespace platform::i18n::detail {

namespace {

// Bits of a letter that the language lacks, in addition to those of a word that ends there. The
// letters of Latin-1 occur in names and borrowed words everywhere; other Latin letters seldom do,
// other scripts hardly ever, and those do not change within a word.
constexpr int westernLetterBits = 10;
constexpr int latinLetterBits = 13;
constexpr int foreignScriptBits = 15;
constexpr int scriptChangeBits = 6;

// Bits of a capital that opens a word or follows another capital, and of one after a small letter.
constexpr double firstCapitalBits = 1;
constexpr double nextCapitalBits = 0.25;
constexpr double capitalInsideWordBits = 7;

// Charsets are used although they lack letters that only occur in names and foreign words: this
// share of a language's letters may be missing.
constexpr double acceptableGap = 0.005;

// Bits that are added where an ideograph meets an ASCII letter, and where it stands alone: then it
// is more often a letter and half of what follows it, the more so when it is rare.
constexpr int besideAsciiBits = 3;
constexpr int loneBits = 4;
constexpr int loneRareBits = 8;
// Half-width katakana after another, whichever it is.
constexpr int nextHalfWidthBits = 6;

// Bits of characters that the samples of an ideographic language hold never or once.
struct UnlistedRange {
    char16_t first;
    char16_t last;
    int bits;
};
constexpr int unlistedIdeographBits = 17;
constexpr int unlistedBits = 22;
constexpr UnlistedRange unlistedRanges[] = {
    {0x0001, 0x007F, 5},                      // as ASCII elsewhere
    {0x0080, 0x024F, 14},                     // Latin
    {0x0370, 0x052F, 14},                     // Greek and Cyrillic
    {0x3040, 0x30FF, 15},                     // kana
    {0x4E00, 0x9FFF, unlistedIdeographBits},  // ideographs
    {0xAC00, 0xD7A3, 18},                     // Hangul
    {0xFF00, 0xFFEF, 13},                     // full-width forms
    {0xFF61, 0xFF9F, 11},                     // half-width katakana
};

// In the tables, costs are printable characters from '0' on.
int quarterBits(char digit) {
    return digit - '0';
}

bool isAsciiLetter(char16_t c) {
    return (c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z');
}

bool isHalfWidthKatakana(char16_t c) {
    return c >= 0xFF61 && c <= 0xFF9F;
}

}  // namespace

BigramModel::BigramModel(const LetterTable& table) : table_(&table) {
    const std::size_t letters = table.alphabet.size();
    const auto western = static_cast<Class>(letters + 1);
    const auto latin = static_cast<Class>(letters + 2);
    foreignScript_ = static_cast<Class>(letters + 3);
    std::array<Class, alphabetLimit> places{};
    for (std::size_t i = 0; i < letters; ++i) {
        if (table.alphabet[i] < alphabetLimit) {
            places[table.alphabet[i]] = static_cast<Class>(i + 1);
        }
    }
    for (std::size_t c = 0; c < alphabetLimit; ++c) {
        const CharacterTraits& traits = traitsOf(static_cast<char16_t>(c));
        if (traits.lower < alphabetLimit && places[traits.lower] != 0) {
            classes_[c] = places[traits.lower];
        } else if (traits.isLetter) {
            const bool isLatinLetter = isLatin() && traits.lower < 0x0250;
            classes_[c] = !isLatinLetter ? foreignScript_ : traits.lower < 0x0100 ? western : latin;
        }
    }
    // The table has no foreign letters: a word ends before each, and another begins after it.
    stride_ = letters + 4;
    costs_.resize(stride_ * stride_);
    for (std::size_t before = 0; before < stride_; ++before) {
        for (std::size_t current = before == 0 ? 1 : 0; current < stride_; ++current) {
            const std::size_t row = before > letters ? 0 : before;
            const std::size_t column = current > letters ? 0 : current;
            Cost cost = quarterBits(table.costs[row * (letters + 1) + column]);
            cost += current == western          ? bits(westernLetterBits)
                    : current == latin          ? bits(latinLetterBits)
                    : current == foreignScript_ ? bits(foreignScriptBits)
                                                : 0;
            cost += current == foreignScript_ && before != 0 ? bits(scriptChangeBits) : 0;
            costs_[before * stride_ + current] = static_cast<std::uint8_t>(cost);
        }
    }
}

bool BigramModel::isWritableWith(std::u16string_view repertoire) const {
    double missing = 0;
    for (std::size_t i = 0; i < table_->alphabet.size(); ++i) {
        const char16_t letter = table_->alphabet[i];
        if (letter >= 0x80 && !std::binary_search(repertoire.begin(), repertoire.end(), letter)) {
            missing += std::exp2(-quarterBits(table_->frequencies[i]) / 4.0);
        }
    }
    return missing < acceptableGap;
}

UnigramModel::UnigramModel(const CharacterTable& table) : costs_(0x10000, bits(unlistedBits)) {
    for (const UnlistedRange& range : unlistedRanges) {
        std::fill(costs_.begin() + range.first, costs_.begin() + range.last + 1,
                  static_cast<std::uint8_t>(bits(range.bits)));
    }
    for (const CharacterGroup& group : table.groups) {
        for (const char16_t c : group.characters) {
            costs_[c] = static_cast<std::uint8_t>(bits(group.halfBits / 2.0));
        }
    }
}

Cost UnigramModel::cost(char16_t before, char16_t current) const {
    if (isHalfWidthKatakana(before) && isHalfWidthKatakana(current)) {
        return bits(nextHalfWidthBits);
    }
    const bool meetsAscii = before != 0 && isAsciiLetter(before) != isAsciiLetter(current);
    return costs_[current] + (meetsAscii ? bits(besideAsciiBits) : 0);
}

Cost UnigramModel::loneCost(char16_t current) const {
    return bits(costs_[current] >= bits(unlistedIdeographBits) ? loneRareBits : loneBits);
}

Cost costOfWords(const TextCounts& counts, const UnigramModel& model, Cost limit) {
    const CharacterTraits* const traits = allTraits();
    Cost cost = 0;
    for (const UnitPair& pair : counts.pairs) {
        if (traits[pair.current].isLetter) {
            const char16_t before = traits[pair.before].isLetter ? pair.before : u'\0';
            cost += pair.count * model.cost(before, traits[pair.current].lower);
            if (cost > limit) {
                return cost;
            }
        }
    }
    for (const UnitTriple& triple : counts.triples) {
        if (traits[triple.current].isLetter && !isLetterBeyondAscii(traits, triple.before) &&
            !isLetterBeyondAscii(traits, triple.after)) {
            cost += triple.count * model.loneCost(triple.current);
        }
    }
    return cost;
}

Cost capitalCost(LetterCase before) {
    return before == LetterCase::small     ? bits(capitalInsideWordBits)
           : before == LetterCase::capital ? bits(nextCapitalBits)
                                           : bits(firstCapitalBits);
}

const std::vector<BigramModel>& bigramModels() {
    static const std::vector<BigramModel> models(letterTables().begin(), letterTables().end());
    return models;
}

const std::vector<UnigramModel>& unigramModels() {
    static const std::vector<UnigramModel> models(characterTables().begin(),
                                                  characterTables().end());
    return models;
}

}  // namespace platform::i18n::detail
