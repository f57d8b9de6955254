// SPDX-License-Identifier: Apache-2.0
// Which legacy charset a text is most likely in.
//
//     cost(charset) = prior(charset) - hint(charset) + beside words(charset)
//                   + least over languages: prior(language) + words(charset, language)
//
// All are numbers of bits: the length of the text in a code made for the language. The charset with
// the lowest cost is taken. README.md says where the figures come from.
//
// Costs only grow as more of a text is looked at, and the commonest pairs of letters are looked at
// first, so candidates that cannot win are dropped early. Charsets of several bytes come
// first: they fail at once on other text, and on their own no other charset comes near them.
#include "platform/i18n/detection/likeliest_charset.h"

#include <algorithm>
#include <limits>
#include <map>
#include <string>
#include <utility>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/detection/text_counts.h"

namespace platform::i18n::detail {

namespace {

// What a text saves in the charset that it names: about as much evidence as ten letters. Many
// declarations are wrong, since documents are converted and their declarations are not.
constexpr Cost hintBits = bits(40);

constexpr Cost infinite = std::numeric_limits<Cost>::max() / 2;

Cost hintFor(const LegacyCharset& charset, const std::string& declared) {
    return !declared.empty() && isSameCharset(charset.name(), declared) ? hintBits : 0;
}

bool isWordByte(char byte) {
    return static_cast<unsigned char>(byte) >= 0x80 || (byte >= 'a' && byte <= 'z') ||
           (byte >= 'A' && byte <= 'Z');
}

// What the plain ASCII words of a text say about the language of its other words.
class LanguagePriors {
public:
    // A word counts half of what it would if all words were of one language: there is code, markup
    // and English everywhere. And a few words beyond ASCII outweigh any number of others.
    static constexpr Cost share = 2;
    static constexpr Cost most = bits(12);
    static constexpr std::size_t enoughLetters = 4000;

    explicit LanguagePriors(std::string_view sample) {
        const AsciiWords words = asciiWordsOf(sample);
        const TextCounts counts(words.text, TextCounts::Runs::all);
        Cost least = infinite;
        for (const BigramModel& model : bigramModels()) {
            if (model.isLatin()) {
                const Cost cost = costOfWords(
                    counts.pairs, model, [&](char16_t c) { return model.classOf(c); }, infinite);
                least = std::min(least, costs_[&model] = cost / share);
            }
        }
        // Languages in other scripts become less likely with the share of Latin in the text.
        const auto ascii = static_cast<Cost>(words.text.size());
        otherScripts_ = most * ascii / (ascii + 4 * static_cast<Cost>(words.beyondAscii) + 1);
        for (auto& [model, cost] : costs_) {
            cost = std::min(most, cost - least);
        }
    }

    Cost of(const BigramModel& model) const {
        return model.isLatin() ? costs_.at(&model) : otherScripts_;
    }
    Cost ofIdeographs() const { return otherScripts_; }

private:
    struct AsciiWords {
        std::u16string text;  // the words, apart
        std::size_t beyondAscii = 0;
    };

    static AsciiWords asciiWordsOf(std::string_view sample);

    std::map<const BigramModel*, Cost> costs_;
    Cost otherScripts_;
};

LanguagePriors::AsciiWords LanguagePriors::asciiWordsOf(std::string_view sample) {
    AsciiWords found;
    for (std::size_t begin = 0; begin < sample.size() && found.text.size() < enoughLetters;) {
        if (sample[begin] == '<') {
            const std::size_t end = sample.find('>', begin);
            begin = end == std::string_view::npos ? begin + 1 : end + 1;
            continue;
        }
        std::size_t end = begin;
        bool isAscii = true;
        for (; end < sample.size() && isWordByte(sample[end]); ++end) {
            isAscii = isAscii && static_cast<unsigned char>(sample[end]) < 0x80;
        }
        if (!isAscii) {
            found.beyondAscii += end - begin;
        } else if (end - begin > 1) {
            found.text.append(sample.begin() + static_cast<std::ptrdiff_t>(begin),
                              sample.begin() + static_cast<std::ptrdiff_t>(end));
            found.text += u' ';
        }
        begin = std::max(end, begin + 1);
    }
    return found;
}

// The search for the cheapest charset.
class Search {
public:
    Search(const Evidence& evidence, const std::vector<const LegacyCharset*>& excluded)
        : evidence_(evidence),
          sample_(evidence.sample),
          isCut_(sample_.size() < evidence.bytes.size() && !sample_.ends_with('\n')),
          excluded_(excluded),
          priors_(sample_) {}

    std::optional<LikelyCharset> cheapest() {
        const bool mayBeEbcdic = looksLikeEbcdic(sample_);
        for (const LegacyCharset& charset : legacyCharsets()) {
            const bool isTried = charset.kind() == CharsetKind::multiByte ||
                                 (charset.kind() == CharsetKind::ebcdic && mayBeEbcdic);
            if (isTried && !isExcluded(charset)) {
                tryDecoded(charset);
            }
        }
        trySingleBytes();
        return best_.charset == nullptr ? std::nullopt : std::optional(best_);
    }

private:
    // A charset of single bytes and one of its languages, with its cost so far.
    struct Reading {
        const LegacyCharset* charset;
        const LegacyCharset::Language* language;
        Cost cost;
    };

    bool isExcluded(const LegacyCharset& charset) const {
        return std::find(excluded_.begin(), excluded_.end(), &charset) != excluded_.end();
    }

    Cost priorOf(const LegacyCharset& charset) const {
        return charset.prior() - hintFor(charset, evidence_.declared);
    }

    void consider(const LegacyCharset& charset, Cost cost) {
        // Of two that cost the same, the commoner one, which comes first in the list.
        if (cost < best_.cost || (cost == best_.cost && &charset < best_.charset)) {
            best_ = {&charset, cost};
        }
    }

    // The text of the sample. One that was taken of a text without a boundary may end inside a
    // character; others are decoded once, as it takes long to find that they cannot be.
    std::optional<std::u16string> decodeSample(const LegacyCharset& charset) const {
        const std::size_t longestCut = isCut_ ? 3 : 0;
        for (std::size_t cut = 0; cut <= std::min(longestCut, sample_.size()); ++cut) {
            if (auto text = charset.decode(sample_.substr(0, sample_.size() - cut))) {
                return text;
            }
        }
        return std::nullopt;
    }

    void tryDecoded(const LegacyCharset& charset) {
        std::optional<std::u16string> text = decodeSample(charset);
        const bool isMultiByte = charset.kind() == CharsetKind::multiByte;
        Cost prior = priorOf(charset);
        if (!text || (isMultiByte && text == lastText_ && prior >= lastPrior_)) {
            return;
        }
        TextCounts counts(*text);
        counts.countTriplesOfCharacters(*text);
        const auto itself = [](char16_t c) { return c; };
        if (charset.kind() == CharsetKind::ebcdic) {
            // DEL costs as little as a sign, since its byte is one in EBCDIC. But there, DEL is the
            // byte of BEL, which is no more frequent in a text than other control codes.
            prior +=
                (strayControlBits - asciiBits) * std::count(text->begin(), text->end(), u'\x7F');
        }
        const Cost cost = prior + costBesideWords(counts, itself, allTraits(), best_.cost - prior);
        if (isMultiByte) {
            for (const UnigramModel& model : unigramModels()) {
                const Cost before = cost + priors_.ofIdeographs();
                consider(charset, before + costOfWords(counts, model, best_.cost - before));
            }
            lastText_ = std::move(text);
            lastPrior_ = prior;
            return;
        }
        for (const auto& [model, classes] : charset.languages()) {
            // No prior of the language: what looks like ASCII words here are other letters.
            const auto classOf = [&model = *model](char16_t c) { return model.classOf(c); };
            consider(charset, cost + costOfWords(counts.pairs, *model, classOf, best_.cost - cost));
        }
    }

    void trySingleBytes() {
        std::u16string units(sample_.size(), u'\0');
        std::transform(sample_.begin(), sample_.end(), units.begin(),
                       [](char byte) { return static_cast<unsigned char>(byte); });
        TextCounts counts(units);
        // The commonest pairs decide which candidates are worth pursuing, the rest which is best.
        const std::span<const UnitPair> pairs(counts.pairs);
        const std::size_t few = std::min(pairs.size(), TextCounts::commonest);
        std::vector<Reading> readings = readingsOf(pairs.first(few));
        const auto mayWin = [&](const Reading& reading) {
            return reading.cost + costIn(reading, pairs.subspan(few)) <= best_.cost;
        };
        // As a rule none may in a text of a multi-byte charset, and counting the triples takes as
        // long as all of the above.
        if (std::none_of(readings.begin(), readings.end(), mayWin)) {
            return;
        }
        counts.countTriplesOfBytes(units);
        // Where one is above the limit that it was computed with, any value above that.
        std::map<const LegacyCharset*, Cost> besideWords;
        for (Reading& reading : readings) {
            const auto [beside, isNew] = besideWords.try_emplace(reading.charset);
            if (isNew) {
                beside->second = besideWordsIn(reading, counts);
            }
            reading.cost += beside->second;
            if (reading.cost <= best_.cost) {
                consider(*reading.charset, reading.cost + costIn(reading, pairs.subspan(few)));
            }
        }
    }

    // The candidates that may still win, with their priors and what `pairs` cost, the cheapest
    // first.
    std::vector<Reading> readingsOf(std::span<const UnitPair> pairs) const {
        std::vector<Reading> readings;
        for (const LegacyCharset& charset : legacyCharsets()) {
            if (charset.kind() != CharsetKind::singleByte || !charset.decodes(evidence_.values) ||
                isExcluded(charset)) {
                continue;
            }
            const Cost prior = priorOf(charset);
            for (const LegacyCharset::Language& language : charset.languages()) {
                Reading reading{&charset, &language, prior + priors_.of(*language.model)};
                reading.cost += costIn(reading, pairs);
                if (reading.cost <= best_.cost) {
                    readings.push_back(reading);
                }
            }
        }
        std::stable_sort(readings.begin(), readings.end(),
                         [](const Reading& a, const Reading& b) { return a.cost < b.cost; });
        return readings;
    }

    Cost besideWordsIn(const Reading& reading, const TextCounts& counts) const {
        const auto characterOf = [&](char16_t byte) {
            return byte == 0 ? u'\0' : reading.charset->characterOf(byte);
        };
        return costBesideWords(counts, characterOf, reading.charset->traits(),
                               best_.cost - reading.cost);
    }

    Cost costIn(const Reading& reading, std::span<const UnitPair> pairs) const {
        const auto classOf = [&classes = reading.language->classes](char16_t byte) {
            return classes[byte];
        };
        return costOfWords(pairs, *reading.language->model, classOf, best_.cost - reading.cost);
    }

    const Evidence& evidence_;
    std::string_view sample_;
    bool isCut_;  // the sample ends anywhere in the file
    const std::vector<const LegacyCharset*>& excluded_;
    LanguagePriors priors_;
    LikelyCharset best_{nullptr, infinite};
    // The last text that was tried, in a charset of several bytes with this prior. Where another
    // charset decodes to the same, as extensions of one do, it can only win by a better prior: of
    // two that cost the same, the first in the list is taken.
    std::optional<std::u16string> lastText_;
    Cost lastPrior_ = 0;
};

}  // namespace

bool looksLikeEbcdic(std::string_view sample) {
    const auto blanks = std::count(sample.begin(), sample.end(), '\x40');
    return blanks > std::count(sample.begin(), sample.end(), '\x20') &&
           static_cast<std::size_t>(blanks) > sample.size() / 20;
}

std::optional<LikelyCharset> likeliestCharset(const Evidence& evidence,
                                              const std::vector<const LegacyCharset*>& excluded) {
    return Search(evidence, excluded).cheapest();
}

const LegacyCharset& largestThatAgrees(const LegacyCharset& charset, const Evidence& evidence) {
    const LegacyCharset* largest = &charset;
    if (charset.kind() == CharsetKind::multiByte ||
        isSameCharset(charset.name(), evidence.declared)) {
        return charset;
    }
    for (const LegacyCharset& other : legacyCharsets()) {
        if (other.prior() <= charset.prior() && other.repertoire() > largest->repertoire() &&
            other.agreesWith(charset, evidence.values) && other.holdsLettersOf(charset)) {
            largest = &other;
        }
    }
    return *largest;
}

}  // namespace platform::i18n::detail
