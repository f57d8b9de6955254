// How plausible decoded text is, as the number of bits in which a reader of one of the known
// languages would write it down: the charset in which a file is shortest is most likely the one it
// was written in.
#pragma once

#include <cstddef>
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

/// The cost of `text` in the one of `languages` that makes it cheapest. Costs of different texts
/// compare when the texts come from the same bytes. Linear in the size of the text and the number
/// of languages.
double costInBits(std::u16string_view text, const std::vector<const Language*>& languages);

}  // namespace platform::i18n::detail
