// SPDX-License-Identifier: Apache-2.0
// The cost of text in the known languages.
//
// Only runs of letters that hold something beyond ASCII tell charsets apart. In them each letter
// costs what the language's table says about it behind its neighbour, and capitals where no one
// writes them cost extra. All other ASCII costs the same everywhere, so that candidates in which
// bytes are ASCII and candidates in which they are halves of characters compare fairly.
#include "platform/i18n/detection/plausibility.h"

#include <unicode/uchar.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <utility>

#include "platform/i18n/detection/language_tables.h"
#include "platform/i18n/detection/symbol_cost.h"

namespace platform::i18n::detail {

namespace {

constexpr double bitsPerAscii = 5;
constexpr double bitsPerStrayControl = 20;
constexpr int westernLetterCost = 10;
constexpr int foreignLetterCost = 13;
constexpr int foreignScriptCost = 15;
constexpr int scriptChangeCost = 6;
constexpr double capitalInsideWordCost = 7;
constexpr double smallAfterCapitalsCost = 5;
constexpr double firstCapitalCost = 1;

constexpr char16_t wordEnd = 0;

// The letters of alphabets, and nothing that the ideographic languages need, lie below this.
constexpr std::size_t alphabetLimit = 0x2000;

constexpr bool isAsciiLetter(char16_t c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isWordByte(char byte) {
    const auto value = static_cast<unsigned char>(byte);
    return value >= 0x80 || isAsciiLetter(value);
}

bool isWordCharacter(char16_t c) {
    if (c == 0x00AA || c == 0x00BA || c == 0x00B5) {
        return false;
    }
    return (U_GET_GC_MASK(c) & (U_GC_L_MASK | U_GC_M_MASK)) != 0;
}

char16_t folded(char16_t c) {
    return static_cast<char16_t>(u_tolower(c));
}

enum class Case : std::uint8_t { none, small, capital };

Case caseOf(char16_t c) {
    if (u_isULowercase(c)) {
        return Case::small;
    }
    return u_isUUppercase(c) ? Case::capital : Case::none;
}

struct CharacterTraits {
    char16_t folded;
    bool isWordCharacter;
    Case letterCase;
};

CharacterTraits findTraits(char16_t c) {
    return {folded(c), isWordCharacter(c), caseOf(c)};
}

// The traits of a character; those of alphabets, which all charsets of single bytes are made of,
// from a table.
CharacterTraits traitsOf(char16_t c) {
    static const auto table = [] {
        std::array<CharacterTraits, alphabetLimit> made{};
        for (std::size_t i = 0; i < made.size(); ++i) {
            made[i] = findTraits(static_cast<char16_t>(i));
        }
        return made;
    }();
    return c < table.size() ? table[c] : findTraits(c);
}

// Two neighbours in words, and how often they are that.
struct Pair {
    char16_t before;
    char16_t current;
    std::uint32_t count;
};

// The pairs of neighbours in `words`, which are closed by `wordEnd` each.
std::vector<Pair> pairsIn(std::u16string_view words) {
    std::vector<Pair> pairs;
    // Places in `pairs`, counted from one, by a hash of the pair.
    std::vector<std::uint32_t> places(std::bit_ceil(2 * words.size() + 1));
    const std::size_t mask = places.size() - 1;
    char16_t before = wordEnd;
    for (const char16_t current : words) {
        std::size_t slot = (before * std::size_t{0x9E3B} ^ current * std::size_t{0x85EB}) & mask;
        while (places[slot] != 0 && (pairs[places[slot] - 1].before != before ||
                                     pairs[places[slot] - 1].current != current)) {
            slot = (slot + 1) & mask;
        }
        if (places[slot] == 0) {
            pairs.push_back({before, current, 0});
            places[slot] = static_cast<std::uint32_t>(pairs.size());
        }
        ++pairs[places[slot] - 1].count;
        before = current;
    }
    return pairs;
}

}  // namespace

class Language {
public:
    virtual ~Language() = default;
    virtual bool isWritableWith(std::u16string_view repertoire) const = 0;
    virtual bool isLatin() const = 0;

    // The cost of runs of word characters, folded, each run closed by `wordEnd`; `pairs` are those
    // in them.
    virtual double costOfWords(std::u16string_view words, const std::vector<Pair>& pairs) const = 0;
};

namespace {

class AlphabeticLanguage final : public Language {
public:
    explicit AlphabeticLanguage(const LetterTable& table)
        : table_(table), size_(table.alphabet.size() + 1) {
        std::uint8_t next = 1;
        for (const char16_t letter : table.alphabet) {
            // Arabic has some presentation forms above the limit, which count as foreign.
            if (letter < alphabetLimit) {
                index_[letter] = next;
            }
            ++next;
        }
    }

    bool isWritableWith(std::u16string_view repertoire) const override {
        // Charsets lack letters that only names and foreign words have, and are used all the same.
        constexpr double acceptableGap = 0.005;
        double missing = 0;
        for (std::size_t i = 0; i < table_.alphabet.size(); ++i) {
            const char16_t letter = table_.alphabet[i];
            if (letter >= 0x80 && repertoire.find(letter) == std::u16string_view::npos) {
                missing += std::exp2((table_.frequencies[i] - '0') / -4.0);
            }
        }
        return missing < acceptableGap;
    }

    bool isLatin() const override { return table_.alphabet.front() == u'a'; }

    double costOfWords(std::u16string_view, const std::vector<Pair>& pairs) const override {
        std::uint64_t quarterBits = 0;
        for (const Pair& pair : pairs) {
            const std::size_t current = indexOf(pair.current);
            std::uint64_t cost = static_cast<std::uint64_t>(
                table_.costs[indexOf(pair.before) * size_ + current] - '0');
            if (current == 0 && pair.current != wordEnd) {
                cost += std::uint64_t{4} *
                        static_cast<unsigned>(foreignCost(pair.current, pair.before));
            }
            quarterBits += pair.count * cost;
        }
        return static_cast<double>(quarterBits) / 4;
    }

private:
    // The place of a letter in the alphabet, from one; zero for what is not in it.
    std::size_t indexOf(char16_t c) const { return c < alphabetLimit ? index_[c] : 0; }

    int foreignCost(char16_t letter, char16_t before) const {
        if (letter < 0x0250 && isLatin()) {
            // Those of Latin-1 turn up in borrowed words and in names everywhere.
            return letter < 0x0100 ? westernLetterCost : foreignLetterCost;
        }
        return foreignScriptCost + (before == wordEnd ? 0 : scriptChangeCost);
    }

    const LetterTable& table_;
    std::size_t size_;
    std::array<std::uint8_t, alphabetLimit> index_{};
};

class IdeographicLanguage final : public Language {
    static constexpr int unlistedIdeographCost = 17;
    // In half bits.
    static constexpr unsigned besideAsciiCost = 6;
    static constexpr unsigned loneCost = 8;
    static constexpr unsigned followingHalfWidthCost = 12;

public:
    explicit IdeographicLanguage(const CharacterTable& table)
        : halfBits_(std::size_t{0x10000}, std::uint8_t{0}) {
        for (std::size_t c = 0; c < halfBits_.size(); ++c) {
            halfBits_[c] = static_cast<std::uint8_t>(2 * costOfUnlisted(static_cast<char16_t>(c)));
        }
        for (const CharacterGroup& group : table.groups) {
            for (const char16_t c : group.characters) {
                halfBits_[c] = static_cast<std::uint8_t>(group.halfBits);
            }
        }
    }

    bool isWritableWith(std::u16string_view) const override { return true; }
    bool isLatin() const override { return false; }

    double costOfWords(std::u16string_view words, const std::vector<Pair>&) const override {
        std::uint64_t halfBits = 0;
        for (std::size_t i = 0; i < words.size(); ++i) {
            const char16_t before = i == 0 ? wordEnd : words[i - 1];
            halfBits += costAmong(before, words[i], i + 1 < words.size() ? words[i + 1] : wordEnd);
        }
        return static_cast<double>(halfBits) / 2;
    }

private:
    // The half bits of `c` between its neighbours.
    unsigned costAmong(char16_t before, char16_t c, char16_t after) const {
        if (isHalfWidthKatakana(before) && isHalfWidthKatakana(c)) {
            return followingHalfWidthCost;
        }
        unsigned cost = halfBits_[c];
        if (before != wordEnd && c != wordEnd && isAsciiLetter(before) != isAsciiLetter(c)) {
            cost += besideAsciiCost;
        }
        // A single ideograph among ASCII is more often a letter and half of what follows it.
        if (c >= 0x80 && before < 0x80 && after < 0x80) {
            cost += cost >= 2 * unlistedIdeographCost ? 2 * loneCost : loneCost;
        }
        return cost;
    }

    static constexpr bool isHalfWidthKatakana(char16_t c) { return c >= 0xFF61 && c <= 0xFF9F; }

    static int costOfUnlisted(char16_t c) {
        if (c < 0x80) {
            return c == wordEnd ? 0 : static_cast<int>(bitsPerAscii);
        }
        if (c >= 0x3040 && c <= 0x30FF) {
            return 15;
        }
        if (c >= 0x4E00 && c <= 0x9FFF) {
            return unlistedIdeographCost;
        }
        if (c >= 0xAC00 && c <= 0xD7A3) {
            return 18;
        }
        if (isHalfWidthKatakana(c)) {
            return 11;
        }
        if (c >= 0xFF00 && c <= 0xFFEF) {
            return 13;
        }
        return c < 0x0250 || (c >= 0x0370 && c < 0x0530) ? 14 : 22;
    }

    std::vector<std::uint8_t> halfBits_;
};

struct Languages {
    std::vector<AlphabeticLanguage> alphabetic;
    std::vector<IdeographicLanguage> ideographic;
    std::vector<const Language*> alphabeticList;
    std::vector<const Language*> ideographicList;
    std::vector<const Language*> all;

    Languages() {
        for (const LetterTable& table : letterTables()) {
            alphabetic.emplace_back(table);
        }
        for (const CharacterTable& table : characterTables()) {
            ideographic.emplace_back(table);
        }
        for (const AlphabeticLanguage& language : alphabetic) {
            alphabeticList.push_back(&language);
        }
        for (const IdeographicLanguage& language : ideographic) {
            ideographicList.push_back(&language);
        }
        all = alphabeticList;
        all.insert(all.end(), ideographicList.begin(), ideographicList.end());
    }
};

const Languages& languages() {
    static const Languages known;
    return known;
}

}  // namespace

// What is the same in every language: the words, and the cost of everything between them.
class TextCost::Dissection {
public:
    explicit Dissection(std::u16string text) : text_(std::move(text)) {}

    // Goes on by `characters`, to the end of the run that is there.
    void advance(std::size_t characters) {
        const std::size_t limit = position_ + std::min(characters, text_.size() - position_);
        while (position_ < limit) {
            const std::size_t end = endOfRun(position_);
            if (end == position_) {
                cost_ += costOfAscii(text_[position_]);
                ++position_;
            } else if (isAsciiRun(position_, end)) {
                cost_ += bitsPerAscii * static_cast<double>(end - position_);
                position_ = end;
            } else {
                dissectRun(position_, end);
                position_ = end;
            }
        }
    }

    bool isAtEnd() const { return position_ == text_.size(); }

    // The words since the last call, each closed by `wordEnd`.
    std::u16string takeWords() { return std::exchange(words_, {}); }

    double cost() const { return cost_; }

private:
    std::size_t endOfRun(std::size_t position) const {
        while (position < text_.size() &&
               (text_[position] >= 0x80 || isAsciiLetter(text_[position]))) {
            ++position;
        }
        return position;
    }

    bool isAsciiRun(std::size_t begin, std::size_t end) const {
        return std::all_of(text_.begin() + static_cast<std::ptrdiff_t>(begin),
                           text_.begin() + static_cast<std::ptrdiff_t>(end),
                           [](char16_t c) { return c < 0x80; });
    }

    static double costOfAscii(char16_t c) {
        const bool stray =
            (c < 0x20 && !(c >= '\t' && c <= '\r') && c != 0x1B && c != 0x1A) || c == 0x7F;
        return stray ? bitsPerStrayControl : bitsPerAscii;
    }

    void dissectRun(std::size_t begin, std::size_t end) {
        Case previous = Case::none;
        bool previousTwoCapital = false;
        for (std::size_t i = begin; i < end; ++i) {
            const char16_t c = text_[i];
            const CharacterTraits traits = traitsOf(c);
            if (!traits.isWordCharacter) {
                if (!words_.empty() && words_.back() != wordEnd) {
                    words_ += wordEnd;
                }
                cost_ += symbolCost(c, {at(i, -1), at(i, 1)});
                previous = Case::none;
                previousTwoCapital = false;
                continue;
            }
            words_ += traits.folded;
            const Case current = traits.letterCase;
            cost_ += costOfCase(previous, previousTwoCapital, current);
            previousTwoCapital = previous == Case::capital && current == Case::capital;
            previous = current;
        }
        if (!words_.empty() && words_.back() != wordEnd) {
            words_ += wordEnd;
        }
    }

    static double costOfCase(Case previous, bool previousTwoCapital, Case current) {
        if (current == Case::capital) {
            return previous == Case::small ? capitalInsideWordCost
                                           : (previous == Case::none ? firstCapitalCost : 0.25);
        }
        return current == Case::small && previousTwoCapital ? smallAfterCapitalsCost : 0;
    }

    char16_t at(std::size_t position, int step) const {
        const std::size_t wanted = position + static_cast<std::size_t>(step);
        return wanted < text_.size() ? text_[wanted] : u'\0';
    }

    std::u16string text_;
    std::size_t position_ = 0;
    std::u16string words_;
    double cost_ = 0;
};

const std::vector<const Language*>& alphabeticLanguages() {
    return languages().alphabeticList;
}

const std::vector<const Language*>& ideographicLanguages() {
    return languages().ideographicList;
}

const std::vector<const Language*>& allLanguages() {
    return languages().all;
}

bool isWritableWith(const Language& language, std::u16string_view repertoire) {
    return language.isWritableWith(repertoire);
}

namespace {

// The ASCII words of `sample`, folded, each closed by `wordEnd`; and how much else there is.
struct AsciiWords {
    std::u16string words;
    std::size_t beyondAscii = 0;
};

AsciiWords asciiWords(std::string_view sample) {
    constexpr std::size_t enough = 4000;
    AsciiWords found;
    std::size_t position = 0;
    while (position < sample.size() && found.words.size() < enough) {
        if (sample[position] == '<') {
            const std::size_t end = sample.find('>', position);
            position = end == std::string_view::npos ? position + 1 : end + 1;
            continue;
        }
        const std::size_t begin = position;
        bool ascii = true;
        while (position < sample.size() && isWordByte(sample[position])) {
            ascii = ascii && static_cast<unsigned char>(sample[position]) < 0x80;
            ++position;
        }
        if (position == begin) {
            ++position;
        } else if (!ascii) {
            found.beyondAscii += position - begin;
        } else if (position - begin > 1) {
            for (const char c : sample.substr(begin, position - begin)) {
                found.words += folded(static_cast<unsigned char>(c));
            }
            found.words += wordEnd;
        }
    }
    return found;
}

}  // namespace

Surroundings::Surroundings(std::string_view sample) {
    constexpr double weight = 0.5;
    constexpr double bound = 12;
    const AsciiWords found = asciiWords(sample);
    const std::vector<Pair> pairs = pairsIn(found.words);
    double cheapest = std::numeric_limits<double>::infinity();
    for (const Language* language : alphabeticLanguages()) {
        if (language->isLatin()) {
            costs_[language] = weight * language->costOfWords(found.words, pairs);
            cheapest = std::min(cheapest, costs_[language]);
        }
    }
    const double share = static_cast<double>(found.words.size()) /
                         static_cast<double>(found.words.size() + 4 * found.beyondAscii + 1);
    for (const Language* language : allLanguages()) {
        costs_[language] =
            language->isLatin() ? std::min(bound, costs_[language] - cheapest) : bound * share;
    }
}

double Surroundings::cost(const Language& language) const {
    return costs_.at(&language);
}

TextCost::TextCost(std::u16string text, const std::vector<const Language*>& languages,
                   const Surroundings& surroundings)
    : dissection_(std::make_unique<Dissection>(std::move(text))) {
    costs_.reserve(languages.size());
    for (const Language* language : languages) {
        costs_.push_back({language, surroundings.cost(*language), 0});
    }
}

TextCost::TextCost(TextCost&&) noexcept = default;
TextCost& TextCost::operator=(TextCost&&) noexcept = default;
TextCost::~TextCost() = default;

void TextCost::lookFurther(std::size_t characters) {
    dissection_->advance(characters);
    const std::u16string words = dissection_->takeWords();
    const std::vector<Pair> pairs = pairsIn(words);
    for (LanguageCost& cost : costs_) {
        // The costs of words are whole quarters of a bit, so the sum does not depend on the pieces.
        cost.words += cost.language->costOfWords(words, pairs);
    }
}

double TextCost::bits() const {
    double cheapest = std::numeric_limits<double>::infinity();
    for (const LanguageCost& cost : costs_) {
        cheapest = std::min(cheapest, cost.words + cost.surroundings);
    }
    return dissection_->cost() + cheapest;
}

bool TextCost::isWhole() const {
    return dissection_->isAtEnd();
}

}  // namespace platform::i18n::detail
