// SPDX-License-Identifier: Apache-2.0
#include "platform/base64/base64.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "tests/platform/base64/plain_encoder.h"

namespace {

using platform::base64decode;
using platform::base64encode;
using platform::DataBuffer;
using platform::base64::plainlyEncoded;
using testing::HasSubstr;
using testing::ThrowsMessage;

std::string encoded(std::string_view bytes) {
    return std::string(base64encode(DataBuffer::copyOf(bytes)).view());
}

std::string decoded(std::string_view text) {
    return std::string(base64decode(text).view());
}

std::string randomBytes(std::size_t length, std::mt19937& random) {
    std::string bytes(length, '\0');
    for (char& byte : bytes) {
        byte = static_cast<char>(random());
    }
    return bytes;
}

const std::vector<std::pair<std::string, std::string>> testVectors = {{"", ""},
                                                                      {"f", "Zg=="},
                                                                      {"fo", "Zm8="},
                                                                      {"foo", "Zm9v"},
                                                                      {"foob", "Zm9vYg=="},
                                                                      {"fooba", "Zm9vYmE="},
                                                                      {"foobar", "Zm9vYmFy"}};

TEST(Base64, EncodesTheStandardsTestVectors) {
    for (const auto& [bytes, text] : testVectors) {
        EXPECT_EQ(encoded(bytes), text);
    }
}

TEST(Base64, DecodesTheStandardsTestVectors) {
    for (const auto& [bytes, text] : testVectors) {
        EXPECT_EQ(decoded(text), bytes);
    }
}

TEST(Base64, AppendsTheTextOfBytesToAString) {
    std::mt19937 random(7);
    for (const std::size_t length :
         {0U, 1U, 2U, 3U, 12'287U, 12'288U, 12'289U, 24'576U, 100'000U}) {
        const std::string bytes = randomBytes(length, random);
        std::string text = "data:";
        base64encode(bytes, text);
        EXPECT_EQ(text, "data:" + plainlyEncoded(bytes)) << length;
    }
}

TEST(Base64, GivesNoStorageForNoBytes) {
    EXPECT_EQ(base64encode(DataBuffer()).data(), nullptr);
    EXPECT_EQ(base64decode("").length(), 0U);
}

TEST(Base64, EncodesOnlyTheBytesInUse) {
    DataBuffer buffer(100);
    buffer.data()[0] = 'f';
    buffer.setLength(1);
    EXPECT_EQ(base64encode(buffer).view(), "Zg==");
}

TEST(Base64, AgreesWithAPlainEncoderForEveryLengthAndGoesBack) {
    std::mt19937 random(1);
    for (std::size_t length = 0; length < 300; ++length) {
        const std::string bytes = randomBytes(length, random);
        const std::string text = encoded(bytes);
        ASSERT_EQ(text, plainlyEncoded(bytes));
        ASSERT_EQ(decoded(text), bytes);
    }
}

TEST(Base64, GoesBackAroundTheSizesAtWhichTheWorkIsSplit) {
    std::mt19937 random(2);
    for (const std::size_t chunk : {24U * 1024, 32U * 1024, 48U * 1024, 96U * 1024}) {
        for (std::size_t length = chunk - 5; length <= chunk + 5; ++length) {
            const std::string bytes = randomBytes(length, random);
            const std::string text = encoded(bytes);
            ASSERT_EQ(text, plainlyEncoded(bytes)) << length;
            ASSERT_EQ(decoded(text), bytes) << length;
        }
    }
}

TEST(Base64, HoldsEveryByteInEveryPlace) {
    for (int byte = 0; byte < 256; ++byte) {
        for (std::size_t place = 0; place < 3; ++place) {
            std::string bytes(3, 'x');
            bytes[place] = static_cast<char>(byte);
            EXPECT_EQ(decoded(encoded(bytes)), bytes);
        }
    }
}

TEST(Base64, WritesNoLineBreaks) {
    EXPECT_EQ(encoded(std::string(10'000, 'a')).find_first_of("\r\n"), std::string::npos);
}

TEST(Base64, SkipsWhiteSpaceWhereverItStands) {
    EXPECT_EQ(decoded(" Z\tg\n=\v=\f\r"), "f");
    EXPECT_EQ(decoded("Zm9v\r\nYmFy\r\n"), "foobar");
    EXPECT_EQ(decoded(" \r\n\t"), "");
    EXPECT_EQ(decoded("    Zm9v    "), "foo");
    EXPECT_EQ(decoded("Zm9v" + std::string(100'000, ' ') + "YmFy"), "foobar");
}

TEST(Base64, SkipsWhiteSpaceInLongText) {
    std::mt19937 random(3);
    const std::string bytes = randomBytes(200'000, random);
    std::string text;
    for (const char c : encoded(bytes)) {
        text.append(random() % 3, " \n\r\t"[random() % 4]);
        text += c;
    }
    EXPECT_EQ(decoded(text), bytes);
}

TEST(Base64, AcceptsMissingPadding) {
    EXPECT_EQ(decoded("Zg"), "f");
    EXPECT_EQ(decoded("Zm8"), "fo");
}

TEST(Base64, RefusesEveryCharacterOutsideTheAlphabet) {
    const std::string allowed =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/ \t\n\v\f\r";
    for (int c = 0; c < 256; ++c) {
        if (allowed.find(static_cast<char>(c)) != std::string::npos) {
            continue;
        }
        for (std::size_t place = 0; place < 8; ++place) {
            std::string text = "Zm9vYmFy";
            text[place] = static_cast<char>(c);
            if (c == '=' && place == 7) {
                continue;  // "Zm9vYmF=" is about left-over bits, below
            }
            EXPECT_THROW(base64decode(text), std::runtime_error) << c << " at " << place;
        }
    }
}

TEST(Base64, RefusesAWholeGroupOfDashesAtTheEnd) {
    EXPECT_THAT([] { base64decode("Zm9v----"); },
                ThrowsMessage<std::runtime_error>(
                    HasSubstr("a character outside the alphabet at offset 4")));
}

TEST(Base64, NamesTheOffsetOfACharacterOutsideTheAlphabet) {
    const std::string text = std::string(100'000, 'A') + " \n*A";
    EXPECT_THAT([&] { base64decode(text); },
                ThrowsMessage<std::runtime_error>(
                    HasSubstr("a character outside the alphabet at offset 100002")));
}

TEST(Base64, RefusesWrongPadding) {
    for (const char* text : {"Zg=", "Zg===", "Zm8==", "Zm9v=", "Zm9v==", "Zm9v====", "=", "===="}) {
        EXPECT_THAT([&] { base64decode(text); },
                    ThrowsMessage<std::runtime_error>(HasSubstr("wrong padding")))
            << text;
    }
}

TEST(Base64, RefusesDataBehindThePadding) {
    for (const char* text : {"Zg==Zg==", "Zg==A", "Zm8=\nZ", "Zg=A", "Zg==*"}) {
        EXPECT_THAT([&] { base64decode(text); },
                    ThrowsMessage<std::runtime_error>(HasSubstr("data after the padding")))
            << text;
    }
}

TEST(Base64, RefusesASingleLeftOverCharacter) {
    for (const char* text : {"Z", "Zm9vY", "Z===", "Z="}) {
        EXPECT_THAT([&] { base64decode(text); },
                    ThrowsMessage<std::runtime_error>(HasSubstr("a single left-over character")))
            << text;
    }
}

TEST(Base64, RefusesLeftOverBitsThatAreNotZero) {
    for (const char* text : {"Zh==", "Zv", "Zm9=", "Zm-"}) {
        EXPECT_THROW(base64decode(text), std::runtime_error) << text;
    }
    EXPECT_THAT([] { base64decode("Zh=="); },
                ThrowsMessage<std::runtime_error>(HasSubstr("left-over bits")));
    EXPECT_THAT([] { base64decode("Zm9="); },
                ThrowsMessage<std::runtime_error>(HasSubstr("left-over bits")));
}

}  // namespace
