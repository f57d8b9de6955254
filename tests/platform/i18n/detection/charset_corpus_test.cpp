// SPDX-License-Identifier: Apache-2.0
// Detection over texts in many languages, in all their usual charsets, at many lengths.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <sstream>

#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace test {
namespace {

using namespace platform::i18n;

constexpr int minimumPerMille = 970;

std::string detect(std::string_view bytes) {
    std::ostringstream diagnostics;
    return detect_charset(bytes.data(), bytes.size(), diagnostics, u"text");
}

// Whether detection reads `bytes` as `text`. Whatever it reads them as has to give the same bytes
// back.
::testing::AssertionResult isReadAs(std::string_view bytes, std::u16string_view text) {
    const std::string charset = detect(bytes);
    codecvt_string_to_ustring decoder(charset, true);
    codecvt_ustring_to_string encoder(charset, true);
    const std::u16string decoded = to_ustring(bytes, decoder);
    if (to_string(decoded, encoder) != bytes) {
        return ::testing::AssertionFailure() << charset << " does not give the bytes back";
    }
    if (decoded == text) {
        return ::testing::AssertionSuccess();
    }
    return ::testing::AssertionFailure()
           << "taken for " << charset << ": " << to_string(text.substr(0, 60));
}

// windows-1258 spells Vietnamese with marks, which the text as written does not.
std::u16string truth(const CorpusEntry& entry, const std::string& utf8, const std::string& bytes) {
    if (entry.charset != "windows-1258") {
        return iconvUtf16(utf8);
    }
    codecvt_string_to_ustring decoder("windows-1258", true);
    return to_ustring(bytes, decoder);
}

// Encodes `utf8` in the entry's charset and checks that it is read rightly.
void expectRead(const CorpusEntry& entry, const std::string& utf8) {
    const std::optional<std::string> bytes = iconvEncode(entry.iconvName, utf8);
    ASSERT_TRUE(bytes) << "the " << entry.language << " text does not fit " << entry.iconvName;
    EXPECT_TRUE(isReadAs(*bytes, truth(entry, utf8, *bytes)))
        << entry.language << " in " << entry.iconvName;
}

// Checks that what `make` makes of each text is read rightly in each charset of its language.
void expectAllRead(const std::function<std::string(const std::string&)>& make) {
    for (const CorpusEntry& entry : corpusEntries()) {
        expectRead(entry, make(corpusText(entry.language)));
    }
}

TEST(Corpus, WholeTextsAreRead) {
    expectAllRead([](const std::string& text) { return text; });
}

TEST(Corpus, AHundredKilobytesAreRead) {
    expectAllRead([](const std::string& text) { return grownTo(text, 100 * 1024); });
}

TEST(Corpus, PagesOfHtmlAreRead) {
    expectAllRead(asHtml);
}

TEST(Corpus, XmlIsRead) {
    expectAllRead(asXml);
}

TEST(Corpus, TablesAreRead) {
    expectAllRead(asCsv);
}

TEST(Corpus, SourceWithCommentsIsRead) {
    expectAllRead(asSource);
}

TEST(Corpus, SubtitlesAreRead) {
    expectAllRead(asSubtitles);
}

// Paragraphs that are read wrongly: their language, charset, and how they begin.
bool isKnownFailure(const CorpusEntry& entry, const std::string& paragraph) {
    // One letter beyond ASCII, in a word that would be one in another language, too.
    return entry.language == "nl" && entry.charset == "macintosh" &&
           paragraph.starts_with("De burgemeester schat");
}

TEST(Corpus, EachParagraphIsRead) {
    constexpr std::size_t paragraph = 120;
    for (const CorpusEntry& entry : corpusEntries()) {
        for (const std::string& line : linesOf(corpusText(entry.language))) {
            if (line.size() >= paragraph && !isKnownFailure(entry, line)) {
                expectRead(entry, line);
            }
        }
    }
}

TEST(Corpus, TypographyIsRead) {
    int texts = 0;
    for (const CorpusEntry& entry : corpusEntries()) {
        const std::string utf8 = withTypography(corpusText(entry.language));
        if (iconvEncode(entry.iconvName, utf8)) {
            expectRead(entry, utf8);
            ++texts;
        }
    }
    EXPECT_GT(texts, 150);
}

// Short lines can be ambiguous to a reader, too; this is what is reached on them.
TEST(ShortLines, AreMostlyRead) {
    int lines = 0;
    int right = 0;
    for (const CorpusEntry& entry : corpusEntries()) {
        for (const std::string& line : linesOf(corpusText(entry.language))) {
            const std::optional<std::string> bytes = iconvEncode(entry.iconvName, line);
            const bool isShort = line.size() >= 20 && line.size() < 120;
            if (!bytes || !isShort || entry.charset == "windows-1258" || *bytes == line) {
                continue;
            }
            ++lines;
            right += isReadAs(*bytes, iconvUtf16(line)) ? 1 : 0;
        }
    }
    RecordProperty("lines", lines);
    RecordProperty("right", right);
    EXPECT_GT(lines, 1800);
    EXPECT_GE(right * 1000, lines * minimumPerMille) << right << " of " << lines;
}

}  // namespace
}  // namespace test
