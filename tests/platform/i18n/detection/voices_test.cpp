// SPDX-License-Identifier: Apache-2.0
// The names that other detectors use.
#include "platform/i18n/detection/voices.h"

#include <gtest/gtest.h>
#include <unicode/ucsdet.h>

#include "platform/i18n/codecvt.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n::detail {
namespace {

bool opens(const std::string& charset) {
    codecvt_string_to_ustring decoder(charset, true);
    codecvt_ustring_to_string encoder(charset, true);
    return true;
}

// All that uchardet 0.0.7 documents, and what other versions of it return.
constexpr const char* uchardetNames[] = {
    "UTF-8",        "UTF-16",       "UTF-16LE",     "UTF-16BE",     "UTF-32",
    "UTF-32LE",     "UTF-32BE",     "ISO-8859-1",   "ISO-8859-2",   "ISO-8859-3",
    "ISO-8859-4",   "ISO-8859-5",   "ISO-8859-6",   "ISO-8859-7",   "ISO-8859-8",
    "ISO-8859-9",   "ISO-8859-10",  "ISO-8859-11",  "ISO-8859-13",  "ISO-8859-15",
    "ISO-8859-16",  "WINDOWS-1250", "WINDOWS-1251", "WINDOWS-1252", "WINDOWS-1253",
    "WINDOWS-1255", "WINDOWS-1256", "WINDOWS-1257", "WINDOWS-1258", "IBM852",
    "IBM855",       "IBM866",       "KOI8-R",       "MAC-CYRILLIC", "MAC-CENTRALEUROPE",
    "TIS-620",      "VISCII",       "BIG5",         "EUC-JP",       "EUC-KR",
    "EUC-TW",       "GB18030",      "GB2312",       "HZ-GB-2312",   "ISO-2022-CN",
    "ISO-2022-JP",  "ISO-2022-KR",  "SHIFT_JIS",    "UHC",          "CP949",
};

TEST(Uchardet, EveryNameThatItReturnsIsKnownToBothConverters) {
    for (const char* name : uchardetNames) {
        const std::string ours = charsetOfUchardet(name);
        ASSERT_NE(ours, "") << name;
        EXPECT_TRUE(opens(ours)) << name;
    }
}

TEST(Uchardet, AsciiAndNothingAreNoGuess) {
    EXPECT_EQ(charsetOfUchardet("ASCII"), "");
    EXPECT_EQ(charsetOfUchardet(""), "");
    EXPECT_EQ(uchardetGuess("plain words"), "");
}

TEST(Uchardet, NamesAreSpeltAsIanaSpellsThem) {
    EXPECT_EQ(charsetOfUchardet("SHIFT_JIS"), "Shift_JIS");
    EXPECT_EQ(charsetOfUchardet("BIG5"), "Big5");
    EXPECT_EQ(charsetOfUchardet("WINDOWS-1251"), "windows-1251");
    EXPECT_EQ(charsetOfUchardet("UHC"), "EUC-KR");
}

TEST(Uchardet, AnswersWithANameOfTheList) {
    for (const testing::CorpusEntry& entry : testing::corpusEntries()) {
        const auto bytes =
            testing::iconvEncode(entry.iconvName, testing::corpusText(entry.language));
        const std::string guess = uchardetGuess(bytes.value());
        EXPECT_TRUE(guess.empty() || opens(guess))
            << entry.language << ' ' << entry.charset << ' ' << guess;
    }
}

TEST(IcuDetector, EveryLegacyNameThatItCanReturnIsKnownOrEbcdic) {
    UErrorCode error = U_ZERO_ERROR;
    UCharsetDetector* const detector = ucsdet_open(&error);
    UEnumeration* const names = ucsdet_getAllDetectableCharsets(detector, &error);
    int count = 0;
    while (const char* name = uenum_next(names, nullptr, &error)) {
        ++count;
        // Hebrew and Arabic mainframe charsets in either direction, which are names of the detector
        // only.
        if (!std::string(name).starts_with("IBM4")) {
            EXPECT_TRUE(opens(name)) << name;
        }
    }
    EXPECT_GT(count, 20);
    uenum_close(names);
    ucsdet_close(detector);
}

TEST(IcuDetector, PutsItsBestGuessFirst) {
    const auto bytes = testing::iconvEncode("KOI8-R", testing::corpusText("ru")).value();
    ASSERT_FALSE(icuGuesses(bytes).empty());
    EXPECT_EQ(icuGuesses(bytes).front(), "KOI8-R");
    EXPECT_TRUE(icuGuesses(std::string(100, '\0')).size() < 40);
}

}  // namespace
}  // namespace platform::i18n::detail
