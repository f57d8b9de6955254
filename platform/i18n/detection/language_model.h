// SPDX-License-Identifier: Apache-2.0
// What letters cost in each language, by how often they follow each other in it.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/character_traits.h"
#include "platform/i18n/detection/language_tables.h"
#include "platform/i18n/detection/text_counts.h"

namespace platform::i18n::detail {

/// The costs of a language with an alphabet: those of letter pairs.
class BigramModel {
public:
    /// What a character is to the model: 0 for no letter, then the letters of the alphabet, then
    /// three kinds of other letters.
    using Class = std::uint8_t;

    /// Made from `table`, which must outlive it.
    explicit BigramModel(const LetterTable& table);

    Class classOf(char16_t c) const {
        return c < alphabetLimit ? classes_[c] : traits_[c].isLetter ? foreignScript_ : Class{0};
    }

    /// The cost of a letter of class `current` after one of class `before`, in whole; 0 where
    /// neither is a letter.
    Cost cost(Class before, Class current) const { return costs_[before * stride_ + current]; }

    bool isLatin() const { return table_->alphabet.front() == u'a'; }

    /// Whether the language can be written with ASCII and the characters `repertoire`, which are
    /// in order.
    bool isWritableWith(std::u16string_view repertoire) const;

private:
    // The letters of alphabets lie below this, but for some presentation forms.
    static constexpr std::size_t alphabetLimit = 0x2000;

    const LetterTable* table_;
    const CharacterTraits* traits_ = allTraits();
    std::size_t stride_;
    std::vector<std::uint8_t> costs_;
    std::array<Class, alphabetLimit> classes_{};
    Class foreignScript_;
};

/// The costs of a language written with thousands of characters: those of single characters, plus a
/// penalty for odd neighbours.
class UnigramModel {
public:
    /// Made from `table`.
    explicit UnigramModel(const CharacterTable& table);

    /// The cost of the letter `current` after `before`, which is '\0' at the beginning of a word.
    Cost cost(char16_t before, char16_t current) const;

    /// What is added where `current` has no other such character next to it in its word.
    Cost loneCost(char16_t current) const;

private:
    std::vector<std::uint8_t> costs_;
};

/// All models, made at the first call. They live as long as the program.
const std::vector<BigramModel>& bigramModels();
const std::vector<UnigramModel>& unigramModels();

/// The cost of words in `model`, or any value above `limit` when it is above that. `pairs` are the
/// neighbours in them; `classOf` says of which class the character is that a unit stands for.
template <class ClassOf>
Cost costOfWords(std::span<const UnitPair> pairs, const BigramModel& model, ClassOf classOf,
                 Cost limit) {
    Cost cost = 0;
    for (const UnitPair& pair : pairs) {
        cost += pair.count * model.cost(classOf(pair.before), classOf(pair.current));
        if (cost > limit) {
            break;
        }
    }
    return cost;
}

/// The same, of a text whose units are characters.
Cost costOfWords(const TextCounts& counts, const UnigramModel& model, Cost limit);

/// The cost of a capital letter after another character.
Cost capitalCost(LetterCase before);

/// The cost of any text apart from the words of a language: its signs, capital letters in odd
/// places and the ASCII between words; or any value above `limit` when it is above that.
/// `characters` holds what each unit of `counts` stands for, `traits` the traits of that.
template <class Characters>
Cost costBesideWords(const TextCounts& counts, const Characters& characters,
                     const CharacterTraits* traits, Cost limit) {
    const CharacterTraits* const all = allTraits();
    Cost cost = counts.asciiCost;
    for (const UnitPair& pair : counts.pairs) {
        if (traits[pair.current].letterCase == LetterCase::capital) {
            cost += pair.count * capitalCost(traits[pair.before].letterCase);
        }
    }
    for (const UnitTriple& triple : counts.triples) {
        if (!traits[triple.current].isLetter) {
            cost += triple.count * signCost(all, characters(triple.before),
                                            characters(triple.current), characters(triple.after));
            if (cost > limit) {
                break;
            }
        }
    }
    return cost;
}

}  // namespace platform::i18n::detail
