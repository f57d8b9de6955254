// SPDX-License-Identifier: Apache-2.0
// Texts in many languages, encoded for tests by a converter that is not the one under test.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace test {

/// A language and a charset that its texts are found in.
struct CorpusEntry {
    std::string language;
    /// The charset's name for the converters under test.
    std::string charset;
    /// Its name for iconv.
    std::string iconvName;
};

/// All languages in all their usual charsets.
const std::vector<CorpusEntry>& corpusEntries();

/// The text in `language`, as UTF-8.
const std::string& corpusText(const std::string& language);

/// UTF-8 text encoded by the C library; nothing when the charset cannot hold it.
std::optional<std::string> iconvEncode(const std::string& iconvName, std::string_view utf8);

/// Bytes decoded to UTF-8 by the C library; nothing when they are malformed.
std::optional<std::string> iconvDecode(const std::string& iconvName, std::string_view bytes);

/// UTF-8 text as UTF-16, by the C library.
std::u16string iconvUtf16(std::string_view utf8);

/// The lines of `text` without the empty ones.
std::vector<std::string> linesOf(std::string_view text);

/// Text of at least `size` bytes: the lines of `text` over and over.
std::string grownTo(std::string_view text, std::size_t size);

/// The text with the quotation marks, dashes and ellipses that a word processor makes of plain
/// ones.
std::string withTypography(std::string_view text);

/// Documents of several kinds around the lines of a text. None of them names a charset.
std::string asHtml(std::string_view text);
std::string asXml(std::string_view text);
std::string asCsv(std::string_view text);
std::string asSource(std::string_view text);
std::string asSubtitles(std::string_view text);

}  // namespace test
