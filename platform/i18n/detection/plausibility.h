// SPDX-License-Identifier: Apache-2.0
// How plausible decoded text is, as the number of bits in which a reader of one of the known
// languages would write it down: the charset in which a file is shortest is most likely the one it
// was written in.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace platform::i18n::detail {

/// The known languages. Opaque to callers, who only hand some of them to `TextCost`.
class Language;

/// All known languages whose letters are written with an alphabet. Lives as long as the program.
const std::vector<const Language*>& alphabeticLanguages();

/// All known languages written with thousands of characters. Lives as long as the program.
const std::vector<const Language*>& ideographicLanguages();

/// All of both.
const std::vector<const Language*>& allLanguages();

/// Whether text in `language` can be written with ASCII and the characters `repertoire`.
bool isWritableWith(const Language& language, std::u16string_view repertoire);

/// What the plain ASCII words of a file say about the language that its other words are in.
class Surroundings {
public:
    /// Takes the words from `sample`, markup left out. Linear in its size.
    explicit Surroundings(std::string_view sample);

    /// The bits that `language` costs among these words, beyond the language that fits them best.
    /// It is bounded: a few words beyond ASCII outweigh any number of others.
    double cost(const Language& language) const;

private:
    std::map<const Language*, double> costs_;
};

/// The cost of a text in the one of some languages that makes it cheapest in its surroundings,
/// found piece by piece from the beginning: often a piece is enough to see that it will be too
/// much. Costs of different texts compare when the texts come from the same bytes.
class TextCost {
public:
    TextCost(std::u16string text, const std::vector<const Language*>& languages,
             const Surroundings& surroundings);
    TextCost(TextCost&&) noexcept;
    TextCost& operator=(TextCost&&) noexcept;
    ~TextCost();

    /// Looks at `characters` more, and at the rest of the run of letters that they end in. Linear
    /// in their number and that of the languages.
    void lookFurther(std::size_t characters);

    /// The bits that all that has been looked at costs: the cost of the text or, as long as it is
    /// not whole, no more than that.
    double bits() const;

    /// Whether all of the text has been looked at.
    bool isWhole() const;

private:
    class Dissection;
    struct LanguageCost {
        const Language* language;
        double surroundings;
        double words;
    };

    std::unique_ptr<Dissection> dissection_;
    std::vector<LanguageCost> costs_;
};

}  // namespace platform::i18n::detail
