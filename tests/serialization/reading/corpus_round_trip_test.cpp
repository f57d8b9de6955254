// SPDX-License-Identifier: Apache-2.0
// Texts in many languages and all their usual charsets, read as documents and written back.

#include <gtest/gtest.h>

#include <array>
#include <optional>
#include <random>
#include <string>

#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/platform/i18n/detection/corpus.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::to_string;
using platform::i18n::to_ustring;
using namespace test;

class CorpusRoundTrip : public testing::Test {
protected:
    /// Reads a file of `mark` and `bytes` and writes it back in the charset that it was read in.
    void expectSameBytes(const std::string& mark, const std::string& bytes) {
        writeFile(path, mark + bytes);
        const std::u16string file = to_ustring(path.string());
        json::Object answer = service.readTextDocument(file);
        ASSERT_TRUE(answer["status"].get<bool>());
        EXPECT_TRUE(answer["data"].get<std::string>() == bytes);

        std::string charset;
        service.readTextFile(file, charset);
        ASSERT_TRUE(service.writeTextDocument(file, answer["data"].get<std::string>(), charset));
        EXPECT_TRUE(readFile(path) == bytes);
    }

    Serialization service;
    test::TemporaryDirectory folder;
    const std::filesystem::path path = folder / "text";
};

TEST_F(CorpusRoundTrip, GivesTheBytesOfEveryTextInEveryCharset) {
    for (const CorpusEntry& entry : corpusEntries()) {
        SCOPED_TRACE(entry.language + " in " + entry.charset);
        const std::optional<std::string> bytes =
            iconvEncode(entry.iconvName, corpusText(entry.language));
        ASSERT_TRUE(bytes);
        expectSameBytes("", *bytes);
    }
}

TEST_F(CorpusRoundTrip, GivesTheBytesOfEveryLine) {
    for (const CorpusEntry& entry : corpusEntries()) {
        SCOPED_TRACE(entry.language + " in " + entry.charset);
        for (const std::string& line : linesOf(corpusText(entry.language))) {
            if (const auto bytes = iconvEncode(entry.iconvName, line)) {
                expectSameBytes("", *bytes);
            }
        }
    }
}

// However the text gets from the file to the answer: what readTextFile decodes is what counts.
TEST_F(CorpusRoundTrip, AnswersWithWhatTheDecodedTextIsInTheFilesCharset) {
    std::mt19937 random(23);
    const std::u16string file = to_ustring(path.string());
    constexpr std::array marks{"", "\xEF\xBB\xBF", "\xFF\xFE", "\xFE\xFF", "\x84\x31\x95\x33"};
    constexpr std::array damages{"", "\x1C", "\x1A", "\x87\x90", "\xFF", "\xE2\x80"};
    for (const CorpusEntry& entry : corpusEntries()) {
        std::string bytes = iconvEncode(entry.iconvName, corpusText(entry.language)).value();
        bytes.insert(0, marks.at(random() % marks.size()));
        bytes.insert(random() % bytes.size(), damages.at(random() % damages.size()));
        writeFile(path, bytes);
        std::string charset;
        const std::u16string text = service.readTextFile(file, charset);
        codecvt_ustring_to_string converter(charset, true);
        EXPECT_TRUE(service.readTextFileContent(file) == to_string(text, converter))
            << entry.language << " in " << entry.charset << ", read as " << charset;
    }
}

TEST_F(CorpusRoundTrip, GivesTheBytesBehindEveryByteOrderMark) {
    const std::string zeros(2, '\0');
    for (const auto& [charset, mark] :
         {std::pair<std::string, std::string>{"UTF-8", "\xEF\xBB\xBF"},
          {"UTF-16LE", "\xFF\xFE"},
          {"UTF-16BE", "\xFE\xFF"},
          {"UTF-32LE", "\xFF\xFE" + zeros},
          {"UTF-32BE", zeros + "\xFE\xFF"}}) {
        for (const std::string language : {"en", "ja", "ar"}) {
            SCOPED_TRACE(language + " in " + charset);
            expectSameBytes(mark, iconvEncode(charset, corpusText(language)).value());
        }
    }
}

}  // namespace
}  // namespace EditorServices
