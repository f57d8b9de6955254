// SPDX-License-Identifier: Apache-2.0
// Every charset that the converters accept: bytes that decode strictly encode again, to the same
// bytes but for the charsets listed here.
#include <gtest/gtest.h>
#include <unicode/ucnv.h>

#include <algorithm>
#include <iterator>
#include <optional>
#include <random>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "platform/i18n/codecvt.h"

namespace platform::i18n {
namespace {

// The charsets in which some bytes come back as others, though always with the same text, by the
// reason for that.

// Some characters have two or three codes; encoding takes one of them.
const std::set<std::string> secondCodes{"Johab",
                                        "Shift_JIS",
                                        "EUC-JP",
                                        "x-Shift_JIS-nec",
                                        "x-Shift_JIS-ibm",
                                        "x-EUC-JP-nec",
                                        "x-Big5-eten",
                                        "ibm-942_P12A-1999",
                                        "ibm-943_P15A-2003",
                                        "ibm-943_P130-1999",
                                        "ibm-33722_P12A_P12A-2009_U2",
                                        "ibm-954_P101-2007",
                                        "euc-jp-2007",
                                        "ibm-1373_P100-2002",
                                        "windows-950-2000",
                                        "ibm-950_P110-1999",
                                        "ibm-1375_P100-2008",
                                        "ibm-5471_P100-2006",
                                        "ibm-1386_P100-2001",
                                        "euc-tw-2014",
                                        "ibm-964_P110-1999",
                                        "ibm-949_P11A-1999",
                                        "ibm-1051_P100-1995",
                                        "ibm-1133_P100-1997",
                                        "ibm-838_P100-1995",
                                        "ibm-1160_P100-1999",
                                        "ebcdic-xml-us"};

// Escapes and shifts that change nothing are left out, and others can be chosen for the same
// characters. Encoding to ISO-2022-KR begins with its designator, and to ISCII with the script.
const std::set<std::string> otherEscapes{"ISO-2022-JP",
                                         "ISO-2022-JP-1",
                                         "ISO-2022-JP-2",
                                         "JIS7",
                                         "JIS8",
                                         "ISO-2022-KR",
                                         "ibm-25546",
                                         "ISO-2022-CN",
                                         "ISO-2022-CN-EXT",
                                         "ISO-2022-CN-CNS",
                                         "ibm-930_P120-1999",
                                         "ibm-933_P110-1995",
                                         "ibm-935_P110-1999",
                                         "ibm-937_P110-1999",
                                         "ibm-939_P120-1999",
                                         "ibm-1364_P110-2007",
                                         "ibm-1371_P100-1999",
                                         "ibm-1388_P103-2001",
                                         "ibm-1390_P110-2003",
                                         "ibm-1399_P110-2003",
                                         "x-ISCII91",
                                         "x-iscii-be",
                                         "x-iscii-pa",
                                         "x-iscii-gu",
                                         "x-iscii-or",
                                         "x-iscii-ta",
                                         "x-iscii-te",
                                         "x-iscii-ka",
                                         "x-iscii-ma"};

// One text has many spellings by design: what to write directly, which window to take.
const std::set<std::string> manySpellings{"UTF-7", "SCSU", "LMBCS-1"};

// Read in the order of the byte-order mark, written little-endian.
const std::set<std::string> orderFromMark{"UTF-16", "UTF16_PlatformEndian", "UTF16_OppositeEndian",
                                          "UTF-32", "UTF32_PlatformEndian", "UTF32_OppositeEndian"};

bool mayChange(const std::string& charset) {
    return secondCodes.count(charset) + otherEscapes.count(charset) + manySpellings.count(charset) +
               orderFromMark.count(charset) !=
           0;
}

bool hasOptions(const char* name) {
    return std::string_view(name).find(',') != std::string_view::npos;
}

bool isKnown(const std::string& charset) {
    try {
        codecvt_string_to_ustring decoder(charset, true);
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

// One name for each converter of ICU's that can be reached, and our own.
std::vector<std::string> charsets() {
    std::vector<std::string> names{
        "UTF-16",    "UTF-32", "ISO-8859-16",     "VISCII",          "Johab",        "EUC-KR",
        "Shift_JIS", "EUC-JP", "x-Shift_JIS-nec", "x-Shift_JIS-ibm", "x-EUC-JP-nec", "x-Big5-eten"};
    for (std::int32_t i = 0; i < ucnv_countAvailable(); ++i) {
        const char* const converter = ucnv_getAvailableName(i);
        UErrorCode error = U_ZERO_ERROR;
        const auto aliases = ucnv_countAliases(converter, &error);
        for (std::uint16_t j = 0; j < aliases; ++j) {
            const char* const name = ucnv_getAlias(converter, j, &error);
            if (!hasOptions(name)) {
                names.emplace_back(name);
                break;
            }
        }
    }
    names.erase(std::remove_if(names.begin(), names.end(),
                               [](const std::string& name) { return !isKnown(name); }),
                names.end());
    return names;
}

std::string hexOf(std::string_view bytes) {
    constexpr std::string_view digits = "0123456789ABCDEF";
    std::string hex;
    for (const char c : bytes) {
        const auto byte = static_cast<unsigned char>(c);
        hex += digits[byte >> 4U];
        hex += digits[byte & 15U];
        hex += ' ';
    }
    return hex;
}

// One charset, and what has come back changed so far.
class RoundTrips {
public:
    explicit RoundTrips(const std::string& charset)
        : charset_(charset), decoder_(charset, true), encoder_(charset, true) {}

    void check(std::string_view bytes) {
        std::u16string text;
        try {
            text = decoder_.do_convert(bytes.data(), bytes.size());
        } catch (const std::runtime_error&) {
            return;
        }
        try {
            const std::string encoded = encoder_.do_convert(text.data(), text.size());
            if (encoded != bytes) {
                checkSameText(bytes, encoded, text);
            }
        } catch (const std::runtime_error& error) {
            ADD_FAILURE() << charset_ << ' ' << hexOf(bytes) << ": " << error.what();
        }
    }

    // The first bytes that came back as others, and these; nothing when all came back.
    const std::optional<std::string>& change() const { return change_; }

private:
    void checkSameText(std::string_view bytes, const std::string& encoded,
                       const std::u16string& text) {
        if (!change_) {
            change_ = hexOf(bytes) + "-> " + hexOf(encoded);
        }
        EXPECT_EQ(decoder_.do_convert(encoded.data(), encoded.size()), text)
            << charset_ << ' ' << hexOf(bytes);
        EXPECT_EQ(text.empty(), bytes.empty()) << charset_ << ' ' << hexOf(bytes);
    }

    std::string charset_;
    codecvt_string_to_ustring decoder_;
    codecvt_ustring_to_string encoder_;
    std::optional<std::string> change_;
};

// The sanitizers' builds are slow and take a sample.
constexpr unsigned pairStep = UNDER_SANITIZERS ? 29 : 1;
constexpr int cutInputs = UNDER_SANITIZERS ? 30 : 300;

void checkShortInputs(RoundTrips& charset) {
    for (unsigned value = 0; value < 0x100; ++value) {
        charset.check(std::string(1, static_cast<char>(value)));
    }
    for (unsigned value = 0; value < 0x10000; value += pairStep) {
        charset.check(std::string{static_cast<char>(value >> 8), static_cast<char>(value)});
    }
}

// Bytes of any kind, and what switches charsets of several sets from one to the other.
std::string randomBytes(std::mt19937& random) {
    constexpr std::string_view switches[] = {
        "\x1B$B",  "\x1B$@",   "\x1B(B", "\x1B(J",       "\x1B(I",  "\x1B$A",  "\x1B$(C",
        "\x1B$(D", "\x1B.A",   "\x1BN",  "\x1B$)C",      "\x1B$)A", "\x1B$)G", "\x1B$*H",
        "\x0E",    "\x0F",     "\n",     "~{",           "~}",      "+",       "-",
        "&",       "\x8E\xA2", "\x8F",   "\x81\x30\x81", "\x1B"};
    const unsigned kind = random() % 4;
    std::string bytes;
    for (auto count = random() % 24; count > 0; --count) {
        if (kind == 3 && random() % 3 == 0) {
            bytes += switches[random() % std::size(switches)];
        } else if (kind == 0) {
            bytes += static_cast<char>(random());
        } else if (kind == 1) {
            bytes += static_cast<char>(random() % 0x80);
        } else {
            bytes += static_cast<char>(random() % 0x5F + 0x20);
        }
    }
    return bytes;
}

// Of three and four bytes, in the charsets that have a regular space of them.
void checkLongCodes(RoundTrips& charset) {
    for (unsigned value = 0; value < 94 * 94; value += pairStep) {
        const std::string pair{static_cast<char>(value / 94 + 0xA1),
                               static_cast<char>(value % 94 + 0xA1)};
        charset.check("\x8F" + pair);
        for (const char plane : {'\xA1', '\xA2', '\xAE'}) {
            charset.check(std::string{'\x8E', plane} + pair);
        }
    }
    for (unsigned value = 0; value < 126 * 10 * 126 * 10; value += 97 * pairStep) {
        charset.check(std::string{
            static_cast<char>(value / 12600 + 0x81), static_cast<char>(value / 1260 % 10 + 0x30),
            static_cast<char>(value / 10 % 126 + 0x81), static_cast<char>(value % 10 + 0x30)});
    }
}

void checkOtherSpellings(RoundTrips& charset) {
    charset.check("+AGE-");
    charset.check(std::string_view("\0\0\xFE\xFF", 4));
}

void checkCutInputs(RoundTrips& charset, std::mt19937& random) {
    for (int i = 0; i < cutInputs; ++i) {
        const std::string bytes = randomBytes(random);
        for (std::size_t length = 0; length <= bytes.size(); ++length) {
            charset.check(std::string_view(bytes).substr(0, length));
        }
    }
}

// The charsets are dealt out to tests that run at the same time.
constexpr std::size_t groupCount = 8;

class EveryCharset : public testing::TestWithParam<std::size_t> {};

TEST_P(EveryCharset, EncodesWhatItDecodesStrictlyToTheSameBytesOrIsListed) {
    const std::vector<std::string> names = charsets();
    for (std::size_t i = GetParam(); i < names.size(); i += groupCount) {
        const std::string& name = names[i];
        std::mt19937 random(static_cast<std::mt19937::result_type>(i));
        RoundTrips charset(name);
        checkShortInputs(charset);
        checkOtherSpellings(charset);
        if (name.starts_with("EUC") || name.starts_with("euc") || name.starts_with("gb18030")) {
            checkLongCodes(charset);
        }
        checkCutInputs(charset, random);
        if (!mayChange(name)) {
            EXPECT_EQ(charset.change(), std::nullopt) << name;
        } else if (pairStep == 1) {
            EXPECT_NE(charset.change(), std::nullopt) << name << " is listed for nothing";
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Groups, EveryCharset, testing::Range<std::size_t>(0, groupCount));

}  // namespace
}  // namespace platform::i18n
