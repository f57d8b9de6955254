// SPDX-License-Identifier: Apache-2.0
// What detection decides, in which order, and what it guarantees.
#include "platform/i18n/detect_charset.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <random>
#include <sstream>
#include <stdexcept>

#include "platform/i18n/codecvt.h"
#include "platform/i18n/detection/legacy_charsets.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n {
namespace {

using std::string_literals::operator""s;
using ::testing::AnyOf;
using ::testing::HasSubstr;

std::string diagnosticsOf(std::string_view bytes, std::u16string_view source = u"<unknown>") {
    std::ostringstream diagnostics;
    detect_charset(bytes.data(), bytes.size(), diagnostics, source);
    return diagnostics.str();
}

std::string detect(std::string_view bytes) {
    std::ostringstream diagnostics;
    return detect_charset(bytes.data(), bytes.size(), diagnostics, u"<unknown>");
}

std::string roundTrip(const std::string& charset, std::string_view bytes) {
    codecvt_string_to_ustring decoder(charset, true);
    codecvt_ustring_to_string encoder(charset, true);
    return to_string(to_ustring(bytes, decoder), encoder);
}

std::string encoded(const std::string& language, const std::string& iconvName) {
    return test::iconvEncode(iconvName, test::corpusText(language)).value();
}

TEST(DetectCharset, TakesEmptyAsciiAndValidUtf8ForUtf8) {
    EXPECT_EQ(detect(""), "UTF-8");
    EXPECT_EQ(detect("plain text\n"), "UTF-8");
    EXPECT_EQ(detect("\xC3\xA9"), "UTF-8");
    EXPECT_EQ(detect("\xF0\x9F\x98\x80"), "UTF-8");
    EXPECT_EQ(detect("a\0b"s), "UTF-8");
}

TEST(DetectCharset, AcceptsNoDataAtAll) {
    std::ostringstream diagnostics;
    EXPECT_EQ(detect_charset(nullptr, 0, diagnostics, u""), "UTF-8");
}

TEST(DetectCharset, FollowsAByteOrderMark) {
    EXPECT_EQ(detect("\xEF\xBB\xBFx"), "UTF-8");
    EXPECT_EQ(detect("\xEF\xBB\xBF"), "UTF-8");
    EXPECT_EQ(detect("\xFF\xFEx\0"s), "UTF-16LE");
    EXPECT_EQ(detect("\xFF\xFE"), "UTF-16LE");
    EXPECT_EQ(detect("\xFE\xFF\0x"s), "UTF-16BE");
    EXPECT_EQ(detect("\xFF\xFE\0\0x\0\0\0"s), "UTF-32LE");
    EXPECT_EQ(detect("\0\0\xFE\xFF\0\0\0x"s), "UTF-32BE");
}

TEST(DetectCharset, TakesAMarkForTextWhereTheRestContradictsIt) {
    EXPECT_EQ(detect("\xFF\xFE\0\0x\0"s), "UTF-16LE");  // no multiple of four bytes
    for (const std::string& bytes : {"\xEF\xBB\xBF\xFF"s, "\xFF\xFEx"s, "\xFE\xFF\xD8\0\0x"s}) {
        EXPECT_EQ(roundTrip(detect(bytes), bytes), bytes);
    }
}

TEST(DetectCharset, ReadsUtf16AndUtf32WithoutAMark) {
    for (const char* charset : {"UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE"}) {
        EXPECT_EQ(detect(test::iconvEncode(charset, "Hello, world").value()), charset);
        for (const char* language :
             {"en", "ru", "el", "he", "ar", "th", "ja", "zh-Hans", "zh-Hant", "ko"}) {
            for (const std::string& line : test::linesOf(test::corpusText(language))) {
                const std::string bytes = test::iconvEncode(charset, line).value();
                // A handful of ideographs can pass for something else.
                if (bytes.size() >= 24) {
                    EXPECT_EQ(detect(bytes), charset) << line;
                }
            }
        }
    }
}

TEST(DetectCharset, ReadsEscapeSequencesThatSpellSomething) {
    EXPECT_EQ(detect("\x1B$B$3$s$K$A$O\x1B(B\n"), "ISO-2022-JP");
    EXPECT_EQ(detect("\x1B$)C\x0E>H3g\x0F\n"), "ISO-2022-KR");
    EXPECT_EQ(detect("~{<:Ky2;NpJ)l6HK!#~}\n"), "HZ-GB-2312");
    EXPECT_EQ(detect(encoded("zh-Hans", "ISO-2022-CN")), "ISO-2022-CN");
}

TEST(DetectCharset, TakesOtherEscapesForAscii) {
    for (const char* text : {"\x1B[31mred\x1B[0m\n", "\x1B", "\x1B$B", "a ~{ b ~} c", "~{",
                             "~~{<:~}", "if (~{x}) ~}"}) {
        const std::string charset = detect(text);
        EXPECT_EQ(charset, "UTF-8") << text;
    }
}

// Such a text is not spelt as the converter spells it, so a save changes its bytes and keeps its
// characters.
TEST(DetectCharset, ReadsEscapeSequencesThatNoConverterWrites) {
    struct Case {
        std::string bytes;
        const char* charset;
        std::u16string text;
    };
    for (const auto& [bytes, charset, text] : {
             Case{"\x1B$B$3\x1B(B\x1B$B$s\x1B(J\x1B(B", "ISO-2022-JP-1", u"\u3053\u3093"},
             Case{"\x1B$B$3$s\x1B(J\n", "ISO-2022-JP", u"\u3053\u3093\n"},
             Case{"\x1B$B$3$s", "ISO-2022-JP", u"\u3053\u3093"},
             Case{"\n\x1B$)C\x0E>H\x0F \x0E"
                  "3g\x0F\n",
                  "ISO-2022-KR", u"\n\uC548 \uB155\n"},
         }) {
        EXPECT_EQ(detect(bytes), charset);
        codecvt_string_to_ustring decoder(charset, true);
        codecvt_ustring_to_string encoder(charset, true);
        EXPECT_EQ(to_ustring(bytes, decoder), text);
        EXPECT_EQ(to_ustring(to_string(text, encoder), decoder), text);
    }
}

TEST(DetectCharset, PrefersTheCharsetThatHoldsMoreOfThoseThatAgree) {
    EXPECT_EQ(detect(encoded("fr", "ISO-8859-1")), "windows-1252");
    EXPECT_EQ(detect(encoded("tr", "ISO-8859-9")), "windows-1254");
    // They differ in some letters of Polish, and in none of Romanian.
    EXPECT_EQ(detect(encoded("pl", "ISO-8859-2")), "ISO-8859-2");
    EXPECT_EQ(detect(encoded("ro", "ISO-8859-2")), "windows-1250");
    // A larger charset that is hardly ever used is not better.
    EXPECT_EQ(detect(test::iconvEncode("CP1251", "\u043F\u0440\u0438\u0432\u0435\u0442").value()),
              "windows-1251");
}

TEST(DetectCharset, KeepsTheCharsetThatADocumentNamesWhereALargerOneAgrees) {
    const std::string page = "<meta charset=iso-8859-1>\n" + encoded("fr", "ISO-8859-1");
    EXPECT_EQ(detect(page), "ISO-8859-1");
}

TEST(DetectCharset, KeepsTheNamedOneOfTwoCharsetsOfWhichOneExtendsTheOther) {
    const std::string simplified = encoded("zh-Hans", "GBK");
    EXPECT_EQ(detect(simplified), "GB18030");
    EXPECT_EQ(detect("<meta charset=gbk>\n" + simplified), "GBK");
    const std::string traditional = encoded("zh-Hant", "BIG5");
    EXPECT_EQ(detect(traditional), "Big5");
    EXPECT_EQ(detect("<meta charset=big5-hkscs>\n" + traditional), "Big5-HKSCS");
}

TEST(DetectCharset, ReadsKazakhInBothOfItsCharsets) {
    const std::string kazakh =
        "\u049A\u0430\u0437\u0430\u049B \u0442\u0456\u043B\u0456 \u049B\u0430\u0437\u0430\u049B "
        "\u0445\u0430\u043B\u049B\u044B\u043D\u044B\u04A3 \u0430\u043D\u0430 "
        "\u0442\u0456\u043B\u0456 \u0431\u043E\u043B\u044B\u043F "
        "\u0442\u0430\u0431\u044B\u043B\u0430\u0434\u044B.";
    EXPECT_EQ(detect(test::iconvEncode("RK1048", kazakh).value()), "KZ-1048");
    EXPECT_EQ(detect(test::iconvEncode("PT154", kazakh).value()), "PTCP154");
}

TEST(DetectCharset, ReadsEbcdic) {
    for (const char* language : {"en", "de", "fr", "es"}) {
        const std::string bytes = encoded(language, "CP037");
        EXPECT_EQ(detect(bytes), "IBM037") << language;
        EXPECT_EQ(roundTrip("IBM037", bytes), bytes);
    }
}

// There, Hebrew letters and blanks have codes that are letters and @ in ASCII.
TEST(DetectCharset, ReadsHebrewInEbcdicThatIsAsciiByItsBytes) {
    int asciiLines = 0;
    for (const std::string& line : test::linesOf(test::corpusText("he"))) {
        const std::string bytes = test::iconvEncode("IBM424", line).value();
        if (bytes.size() < 60) {
            continue;  // EBCDIC is so rare that a few words are no proof of it
        }
        EXPECT_EQ(detect(bytes), "IBM424") << line;
        EXPECT_EQ(roundTrip("IBM424", bytes), bytes);
        const bool isAscii = std::all_of(bytes.begin(), bytes.end(), [](char c) {
            return static_cast<unsigned char>(c) < 0x80;
        });
        asciiLines += isAscii ? 1 : 0;
    }
    EXPECT_GT(asciiLines, 0);
}

TEST(DetectCharset, TakesAsciiForItselfHoweverManyItsAtSigns) {
    for (const char* text :
         {"@", "@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@@", "ABC@DEF@GHI",
          "ada@example.org\nben@example.org\neve@example.com\n", "@media\n@import\n@page\n",
          "@BEEF@DEAD@FACE@FEED@CAFE@BABE@FADE@BEAD@DEED@FEEB@ACED@BADE\n",
          "@@@@@@@@\n@@@  @@@\n@@@@@@@@\n", "@property\n@staticmethod\n@dataclass\n",
          "GATTACA@GATTACA@CATTAGA@GAGA@ACTA@TATA@CAT", "HIGHER@EDUCATION@FOR@ALL",
          "EEEE@EEEE@EEEE@EEEE@EEEE"}) {
        EXPECT_EQ(detect(text), "UTF-8") << text;
    }
    std::mt19937 random(3);
    for (int round = 0; round < 3000; ++round) {
        std::string text(random() % 300, '@');
        for (char& c : text) {
            c = random() % 6 == 0 ? '@' : static_cast<char>(0x20 + random() % 0x5F);
        }
        EXPECT_EQ(detect(text), "UTF-8") << text;
    }
    // Of what is letters in both.
    const std::string_view letters = "ABCDEFGHIQRSTUVWXY";
    for (int round = 0; round < 300; ++round) {
        std::string text(60 + random() % 300, '@');
        for (char& c : text) {
            c = random() % 6 == 0 ? '@' : letters[random() % letters.size()];
        }
        EXPECT_EQ(detect(text), "UTF-8") << text;
    }
}

// There, DEL is a quotation mark and @ a blank.
TEST(DetectCharset, TakesNoTextWithManyDeletesForEbcdic) {
    constexpr std::array separators{"\x7F", "@\x7F", "\x7F\x7F@"};
    constexpr std::array words{"the", "quick", "user", "NAME", "FOX", "A"};
    std::mt19937 random(5);
    for (int round = 0; round < 1000; ++round) {
        const char* const separator = separators[random() % separators.size()];
        std::string text;
        for (std::size_t i = 1 + random() % 60; i != 0; --i) {
            text += words[random() % words.size()];
            text += separator;
        }
        EXPECT_EQ(detect(text), "UTF-8") << text;
        text += std::string("caf\xE9") + separator + "d\xE9j\xE0" + separator;
        EXPECT_NE(detect(text), "IBM037") << text;
        EXPECT_NE(detect(text), "IBM424") << text;
    }
}

// There, BEL is DEL.
TEST(DetectCharset, TakesNoShortTextWithABellForEbcdic) {
    for (const char* const text : {"a@b@\x07", "FACE@@\x07", "@\x07", "the@quick@FOX@\x07"}) {
        EXPECT_EQ(detect(text), "UTF-8") << text;
    }
}

TEST(DetectCharset, TakesNoArmenianInUtf16ForEbcdicWhoseTabsAndBlanksItHas) {
    std::string units;
    for (const char16_t c :
         std::u16string_view(u"\u0540\u0531\u0545\u0531\u054D\u054F\u0531\u0546"
                             u"\u0540\u0531\u0545\u0531\u054D\u054F\u0531\u0546")) {
        units += static_cast<char>(c >> 8);
        units += static_cast<char>(c & 0xFF);
    }
    EXPECT_NE(detect(units), "IBM424");
}

TEST(DetectCharset, ReadsAPageInManyLanguages) {
    std::string page;
    for (const char* language : {"fr", "de", "es", "pt", "it", "nl", "sv", "da", "fi", "is"}) {
        page += test::linesOf(test::corpusText(language)).front() + '\n';
    }
    EXPECT_EQ(detect(test::iconvEncode("CP1252", page).value()), "windows-1252");
}

TEST(DetectCharset, PrefersCharactersToControls) {
    // 80 to 9F are controls in the charsets of ISO 8859, and syllables or dashes in others.
    EXPECT_EQ(
        detect(test::iconvEncode("CP949", "\uBDC1\uD6A8 \uB625 \uC4F0\uB2E4 \uAC00\uB294 \uC0D8")
                   .value()),
        "EUC-KR");
    EXPECT_EQ(detect("\x93quoted\x94 \x96 and so on"), "windows-1252");
}

TEST(DetectCharset, SpellsNamesAsIanaDoes) {
    EXPECT_EQ(detect(encoded("ja", "CP932")), "Shift_JIS");
    EXPECT_EQ(detect(encoded("ja", "EUC-JP")), "EUC-JP");
    EXPECT_EQ(detect(encoded("ko", "EUC-KR")), "EUC-KR");
    EXPECT_EQ(detect(encoded("zh-Hant", "BIG5")), "Big5");
    EXPECT_EQ(detect(encoded("zh-Hans", "GB2312")), "GB18030");
    EXPECT_EQ(detect(encoded("ru", "CP1251")), "windows-1251");
    EXPECT_EQ(detect(encoded("ru", "KOI8-R")), "KOI8-R");
    EXPECT_EQ(detect(encoded("pl", "ISO-8859-2")), "ISO-8859-2");
    EXPECT_EQ(detect(encoded("el", "ISO-8859-7")), "ISO-8859-7");
}

TEST(DetectCharset, ReadsShiftJisThatHoldsControlCodes) {
    const std::string bytes = "\x82\xB1\x82\xEA\x82\xCD\x1C\x82\xC5\x82\xB7\x1A\x81\x42\n";
    EXPECT_EQ(detect(bytes), "Shift_JIS");
    EXPECT_EQ(roundTrip("Shift_JIS", bytes), bytes);
}

TEST(DetectCharset, BelievesWhatADocumentSaysWhereItsTextIsAmbiguous) {
    const std::string word = "\xE9\xF2\xE1";
    for (const char* charset : {"windows-1251", "koi8-r", "ISO-8859-2", "windows-1253"}) {
        const std::string page = "<meta charset=\""s + charset + "\"><p>" + word + "</p>";
        codecvt_string_to_ustring expected(charset, true);
        codecvt_string_to_ustring found(detect(page), true);
        EXPECT_EQ(to_ustring(page, found), to_ustring(page, expected)) << charset;
    }
}

TEST(DetectCharset, DoesNotBelieveADocumentWhoseTextContradictsIt) {
    for (const char* lie : {"utf-8", "iso-8859-1", "us-ascii", "shift_jis", "nonesuch", "utf-16"}) {
        const std::string page =
            "<html><head><meta charset=\""s + lie + "\"></head>\n" + encoded("ru", "KOI8-R");
        EXPECT_EQ(detect(page), "KOI8-R") << lie;
    }
}

TEST(DetectCharset, FindsTheOneLetterThatTellsCharsetsApartInALargeFile) {
    // The euro sign and the z with caron tell ISO-8859-15 from ISO-8859-1.
    std::string utf8 = test::grownTo(test::corpusText("fi"), 300 * 1000);
    utf8.insert(utf8.find('\n', 151234) + 1,
                "D\xC5\xBEonkki maksoi 20 \xE2\x82\xAC ja \xC5\xA1"
                "akki 5 \xE2\x82\xAC.\n");
    const std::string bytes = test::iconvEncode("ISO-8859-15", utf8).value();
    codecvt_string_to_ustring decoder(detect(bytes), true);
    EXPECT_TRUE(to_ustring(bytes, decoder) == test::iconvUtf16(utf8));
}

TEST(DetectCharset, FindsTheFewLettersOfALargeFileThatIsAsciiAlmostThroughout) {
    std::string bytes(3 * 1000 * 1000, 'x');
    for (std::size_t i = 79; i < bytes.size(); i += 80) {
        bytes[i] = '\n';
    }
    bytes.insert(2 * 1000 * 1000, " " +
                                      test::iconvEncode("CP1251",
                                                        "\xD0\xBF\xD1\x80\xD0\xB8\xD0\xB2\xD0"
                                                        "\xB5\xD1\x82 \xD0\xBC\xD0\xB8\xD1\x80")
                                          .value() +
                                      " ");
    EXPECT_EQ(detect(bytes), "windows-1251");
}

TEST(DetectCharset, ReadsLargeTextWithoutASpaceOrAnEndOfLine) {
    for (const auto& [language, iconvName, charset] :
         {std::tuple{"zh-Hans", "GB18030", "GB18030"}, {"ja", "EUC-JP", "EUC-JP"}}) {
        std::string solid;
        for (const std::string& line : test::linesOf(test::corpusText(language))) {
            for (const char c : line) {
                solid += static_cast<unsigned char>(c) < 0x80 ? ""s : std::string(1, c);
            }
        }
        while (solid.size() < 200000) {
            solid += solid;
        }
        for (const std::string& prefix : {""s, "x"s}) {
            EXPECT_EQ(detect(test::iconvEncode(iconvName, prefix + solid).value()), charset);
        }
    }
}

TEST(DetectCharset, KeepsTheBytesOfDamagedUtf8) {
    for (const char* language : {"fr", "ru", "ja"}) {
        std::string bytes = test::corpusText(language);
        bytes.erase(bytes.size() - 40, 1);
        bytes[100] = '\xFF';
        EXPECT_EQ(detect(bytes), "ISO-8859-1");
        EXPECT_EQ(roundTrip(detect(bytes), bytes), bytes);
    }
}

TEST(DetectCharset, SaysSoWhenNothingFitsAndIsSilentOtherwise) {
    std::string binary;
    for (int i = 0; i < 4096; ++i) {
        binary += static_cast<char>(i * 7 % 251);
    }
    EXPECT_EQ(detect(binary), "ISO-8859-1");
    EXPECT_THAT(diagnosticsOf(binary, u"caf\u00E9.bin"), HasSubstr("caf\xC3\xA9.bin"));
    const std::string line = diagnosticsOf(binary);
    EXPECT_EQ(std::count(line.begin(), line.end(), '\n'), 1);
    EXPECT_EQ(line.back(), '\n');
    for (const std::string& text : {""s, "abc"s, "\xEF\xBB\xBF"s, encoded("ru", "KOI8-R"),
                                    encoded("ja", "ISO-2022-JP"), encoded("zh-Hans", "UTF-16LE")}) {
        EXPECT_EQ(diagnosticsOf(text), "");
    }
}

TEST(DetectCharset, NamesASourceWithBrokenCharactersToo) {
    EXPECT_THAT(diagnosticsOf("\xFF\0\1\2\3\4\5\6"s, u"x\xD800y"), HasSubstr("x\xEF\xBF\xBDy"));
}

TEST(DetectCharset, AnyBytesComeBackFromWhatItReturns) {
    std::mt19937 random(11);
    for (int round = 0; round < 3000; ++round) {
        std::string bytes(random() % 200, '\0');
        // All bytes; bytes above ASCII; pairs that look like East Asian text.
        const unsigned lowest = round % 3 == 0 ? 0 : round % 3 == 1 ? 0x80 : 0xA1;
        for (char& byte : bytes) {
            byte = static_cast<char>(random() % 8 == 0 ? random() % 0x60 + 0x20
                                                       : lowest + random() % (0x100 - lowest));
        }
        const std::string charset = detect(bytes);
        ASSERT_EQ(roundTrip(charset, bytes), bytes) << charset;
    }
}

TEST(DetectCharset, TellsWhichCharsetsHaveEscapeSequences) {
    for (const char* charset : {"ISO-2022-JP", "ISO-2022-JP-1", "ISO-2022-JP-2", "ISO-2022-KR",
                                "ISO-2022-CN", "ISO-2022-CN-EXT", "HZ-GB-2312"}) {
        EXPECT_TRUE(hasEscapeSequences(charset)) << charset;
    }
    for (const char* charset : {"UTF-8", "UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE",
                                "x-Shift_JIS-nec", "x-EUC-JP-nec", "x-Big5-eten"}) {
        EXPECT_FALSE(hasEscapeSequences(charset)) << charset;
    }
    for (const detail::LegacyCharset& charset : detail::legacyCharsets()) {
        EXPECT_FALSE(hasEscapeSequences(charset.name())) << charset.name();
    }
}

TEST(DetectCharset, ReadsDuplicateCodesAndGivesThemBack) {
    struct Case {
        const char* language;
        const char* iconvName;
        std::string code;
        char16_t character;
    };
    for (const auto& [language, iconvName, code, character] : {
             Case{"ja", "CP932", "\x87\x90", u'\u2252'},
             Case{"ja", "CP932", "\x81\xE0", u'\u2252'},
             Case{"ja", "CP932", "\xEE\xE0", u'\u9AD9'},
             Case{"ja", "CP932", "\xFB\xFC", u'\u9AD9'},
             Case{"ja", "CP932", "\xFA\x4A", u'\u2160'},
             Case{"ja", "CP932", "\x87\x54", u'\u2160'},
             Case{"ja", "CP932", "\xFA\x54", u'\uFFE2'},
             Case{"ja", "EUC-JP", "\xAD\xF0", u'\u2252'},
             Case{"zh-Hant", "BIG5", "\xA2\xA4", u'\u2550'},
             Case{"zh-Hant", "BIG5", "\xF9\xF9", u'\u2550'},
         }) {
        const std::string bytes = encoded(language, iconvName) + code;
        codecvt_string_to_ustring decoder(detect(bytes), true);
        EXPECT_EQ(to_ustring(bytes, decoder).back(), character) << detect(bytes);
        EXPECT_EQ(roundTrip(detect(bytes), bytes), bytes);
    }
}

TEST(DetectCharset, KeepsTheBytesWhereBothCodesOfACharacterOccur) {
    const std::string bytes = encoded("ja", "CP932") + "\x87\x90\x81\xE0";
    EXPECT_EQ(detect(bytes), "ISO-8859-1");
    EXPECT_NE(diagnosticsOf(bytes), "");
}

TEST(DetectCharset, SurvivesCodesOfCharactersThatTheCharsetDoesNotEncode) {
    // In EUC-JP, two bytes after the single shift stand for characters that it has no code for.
    for (int byte = 0x80; byte <= 0xFF; ++byte) {
        const std::string bytes = "?J\x8E" + std::string(1, static_cast<char>(byte));
        EXPECT_EQ(roundTrip(detect(bytes), bytes), bytes) << byte;
    }
}

TEST(DetectCharset, RefusesTextThatIsTooLargeBeforeItLooksAtIt) {
    // Nobody may read these bytes: there are none after the first.
    const char first = 'a';
    std::ostringstream diagnostics;
    EXPECT_THAT([&] { detect_charset(&first, maxTextLength + 1, diagnostics, u"text"); },
                ::testing::ThrowsMessage<std::runtime_error>(
                    "The text is too large: 1073741825 bytes, at most 1073741824 are accepted"));
}

TEST(LegacyCharsets, OpenInBothConvertersAndAreMadeForSomeLanguage) {
    for (const detail::LegacyCharset& charset : detail::legacyCharsets()) {
        EXPECT_NO_THROW(codecvt_string_to_ustring(charset.name(), true));
        EXPECT_NO_THROW(codecvt_ustring_to_string(charset.name(), true));
        EXPECT_NE(charset.languages().empty(), charset.kind() != detail::CharsetKind::multiByte)
            << charset.name();
    }
}

}  // namespace
}  // namespace platform::i18n
