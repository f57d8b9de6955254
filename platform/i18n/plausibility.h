// How plausible decoded text is, as the number of bits in which a reader of one of the known
// languages would write it down: the charset in which a file is shortest is most likely the one it
// was written in.
#pragma once

#include <map>
#include <string_view>
#include <vector>

namespace platform::i18n::detail {

/// The known languages. Opaque to callers, who only hand some of them to `costInBits`.
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

/// The cost of `text` in the one of `languages` that makes it cheapest in its surroundings. Costs
/// of different texts compare when the texts come from the same bytes. Linear in the size of the
/// text and the number of languages.
double costInBits(std::u16string_view text, const std::vector<const Language*>& languages,
                  const Surroundings& surroundings);

}  // namespace platform::i18n::detail
