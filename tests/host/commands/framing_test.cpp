// SPDX-License-Identifier: Apache-2.0
#include "host/commands/framing.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <functional>
#include <limits>
#include <optional>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace host {
namespace {

using ::testing::HasSubstr;
using ::testing::SizeIs;

using Message = std::pair<std::string, std::string>;

constexpr std::size_t maxPayload = 1'000'000;

// Gives out `bytes` in pieces whose sizes `nextPiece` tells.
ByteSource sourceOf(
    std::string bytes, std::function<std::size_t()> nextPiece = [] {
        return std::numeric_limits<std::size_t>::max();
    }) {
    return [bytes = std::move(bytes), nextPiece = std::move(nextPiece), at = std::size_t{0}](
               char* to, std::size_t room) mutable {
        const std::size_t count = std::min({room, bytes.size() - at, nextPiece()});
        std::memcpy(to, bytes.data() + at, count);
        at += count;
        return count;
    };
}

std::vector<Message> readAll(ByteSource source) {
    FrameReader reader(std::move(source), maxPayload);
    std::vector<Message> messages;
    while (std::optional<Frame> frame = reader.next()) {
        messages.emplace_back(frame->channel, frame->payload.view());
    }
    return messages;
}

std::vector<Message> readAll(std::string bytes) {
    return readAll(sourceOf(std::move(bytes)));
}

// The text of the error that reading `bytes` ends in.
std::string errorOf(std::string bytes) {
    try {
        readAll(std::move(bytes));
    } catch (const FramingError& error) {
        return error.what();
    }
    return "no error";
}

std::string frame(const Message& message) {
    return frameHeaders(message.first, message.second.size()) + message.second;
}

TEST(FrameReader, TakesAFrameApart) {
    EXPECT_EQ(readAll("Channel: /a\r\nContent-Length: 5\r\n\r\nhello"),
              (std::vector<Message>{{"/a", "hello"}}));
}

TEST(FrameReader, FindsNothingInAnEmptyInput) {
    EXPECT_THAT(readAll(""), SizeIs(0));
}

TEST(FrameReader, TakesFramesOneAfterTheOther) {
    EXPECT_EQ(readAll(frame({"/a", "1"}) + frame({"/b", ""}) + frame({"/c", "\r\n\r\n"})),
              (std::vector<Message>{{"/a", "1"}, {"/b", ""}, {"/c", "\r\n\r\n"}}));
}

TEST(FrameReader, TakesTheHeadersInEitherOrder) {
    EXPECT_EQ(readAll("Content-Length: 1\r\nChannel: /a\r\n\r\nx"),
              (std::vector<Message>{{"/a", "x"}}));
}

TEST(FrameReader, ComparesHeaderNamesWithoutCase) {
    EXPECT_EQ(readAll("CHANNEL: /A\r\ncontent-length: 1\r\n\r\nx"),
              (std::vector<Message>{{"/A", "x"}}));
}

TEST(FrameReader, SkipsBlanksBetweenTheColonAndTheValueOnly) {
    EXPECT_EQ(readAll("Channel: \t/a b \r\nContent-Length:1\r\n\r\nx"),
              (std::vector<Message>{{"/a b ", "x"}}));
}

TEST(FrameReader, KeepsEveryByteOfAChannelAndAPayload) {
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) {
        bytes += static_cast<char>(byte);
    }
    std::string channel = "/" + bytes;
    std::erase_if(channel, [](char c) { return c == '\r' || c == '\n'; });
    EXPECT_EQ(readAll(frame({channel, bytes})), (std::vector<Message>{{channel, bytes}}));
}

TEST(FrameReader, ReadsPayloadsOfAnySizeInAnyPieces) {
    std::mt19937 random(1);
    for (std::size_t size : {0U, 1U, 65535U, 65536U, 65537U, 500'000U, 1'000'000U}) {
        std::string payload(size, '\0');
        std::generate(payload.begin(), payload.end(), [&] { return static_cast<char>(random()); });
        const std::vector<Message> messages{{"/first", payload}, {"/second", "x"}};
        const ByteSource source = sourceOf(frame(messages[0]) + frame(messages[1]),
                                           [&random] { return 1 + random() % 30'000; });
        EXPECT_EQ(readAll(source), messages) << size;
    }
}

TEST(FrameReader, ReadsAnInputThatComesByteByByte) {
    const std::vector<Message> messages{{"/a", "one"}, {"/b", "two"}};
    EXPECT_EQ(readAll(sourceOf(frame(messages[0]) + frame(messages[1]), [] { return 1; })),
              messages);
}

TEST(FrameReader, NamesTheMessageThatIsFramedWrongly) {
    EXPECT_THAT(errorOf(frame({"/a", "1"}) + frame({"/b", "2"}) + "x\r\n"),
                HasSubstr("message 3 of the input is not framed rightly"));
}

struct BadFrame {
    const char* name;
    std::string bytes;
    std::string error;
};

class FrameReaderRefuses : public ::testing::TestWithParam<BadFrame> {};

TEST_P(FrameReaderRefuses, WithItsReason) {
    EXPECT_THAT(errorOf(GetParam().bytes), HasSubstr(GetParam().error));
}

INSTANTIATE_TEST_SUITE_P(
    Input, FrameReaderRefuses,
    ::testing::Values(
        BadFrame{"NoHeaders", "\r\n", "no Channel header"},
        BadFrame{"NoChannel", "Content-Length: 1\r\n\r\nx", "no Channel header"},
        BadFrame{"NoLength", "Channel: /a\r\n\r\nx", "no Content-Length header"},
        BadFrame{"TwoChannels", "Channel: /a\r\nchannel: /a\r\nContent-Length: 1\r\n\r\nx",
                 "two Channel headers"},
        BadFrame{"TwoLengths", "Channel: /a\r\nContent-Length: 1\r\nContent-Length: 1\r\n\r\nx",
                 "two Content-Length headers"},
        BadFrame{"AnUnknownHeader", "Channel: /a\r\nX-Other: 1\r\n\r\n",
                 "header \"X-Other\" is not known"},
        BadFrame{"ABlankBeforeTheColon", "Channel : /a\r\n\r\n",
                 "header \"Channel \" is not known"},
        BadFrame{"NoColon", "Channel\r\n\r\n", "header line \"Channel\" has no colon"},
        BadFrame{"AnEmptyChannel", "Channel: \r\nContent-Length: 1\r\n\r\nx", "Channel is empty"},
        BadFrame{"AnEmptyLength", "Channel: /a\r\nContent-Length:\r\n\r\n",
                 "\"\" is not a decimal number"},
        BadFrame{"ANegativeLength", "Channel: /a\r\nContent-Length: -1\r\n\r\n",
                 "\"-1\" is not a decimal number"},
        BadFrame{"ASignedLength", "Channel: /a\r\nContent-Length: +1\r\n\r\n",
                 "\"+1\" is not a decimal number"},
        BadFrame{"AHexadecimalLength", "Channel: /a\r\nContent-Length: 0x1\r\n\r\n",
                 "\"0x1\" is not a decimal number"},
        BadFrame{"ABlankBehindTheLength", "Channel: /a\r\nContent-Length: 1 \r\n\r\n",
                 "\"1 \" is not a decimal number"},
        BadFrame{"ALengthAboveTheLimit", "Channel: /a\r\nContent-Length: 1000001\r\n\r\n",
                 "\"1000001\" is above the limit of 1000000 bytes"},
        BadFrame{"ALengthOfManyDigits",
                 "Channel: /a\r\nContent-Length: 99999999999999999999999\r\n\r\n",
                 "is above the limit of 1000000 bytes"},
        BadFrame{"LinesThatEndInLf", "Channel: /a\nContent-Length: 1\n\nx", "ends in LF"},
        BadFrame{"ALoneCr", "Channel: /a\rContent-Length: 1\r\n\r\nx", "CR that no LF follows"},
        BadFrame{"AnOverlongLine", "Channel: " + std::string(maxHeaderLine - 8, 'a') + "\r\n",
                 "longer than 65536 bytes"},
        BadFrame{"AnEndlessLine", std::string(10 * maxHeaderLine, 'a'), "longer than 65536 bytes"},
        BadFrame{"TheEndInAHeader", "Channel: /a\r\nConte", "ends in its headers"},
        BadFrame{"TheEndInALineEnd", "Channel: /a\r", "ends in its headers"},
        BadFrame{"TheEndBeforeTheEmptyLine", "Channel: /a\r\nContent-Length: 0\r\n",
                 "ends in its headers"},
        BadFrame{"TheEndInAPayload", "Channel: /a\r\nContent-Length: 10\r\n\r\nabc",
                 "ends after 3 of the 10 bytes of its payload"},
        BadFrame{"TheEndBeforeAPayload", "Channel: /a\r\nContent-Length: 10\r\n\r\n",
                 "ends after 0 of the 10 bytes of its payload"}),
    [](const auto& instance) { return instance.param.name; });

TEST(FrameReader, TakesAHeaderLineOfTheGreatestLength) {
    const std::string channel(maxHeaderLine - std::string_view("Channel: ").size(), 'a');
    EXPECT_EQ(readAll(frame({channel, "x"})), (std::vector<Message>{{channel, "x"}}));
}

TEST(FrameReader, ShowsABadHeaderWithoutItsControlCharactersAndShortened) {
    const std::string error = errorOf("\x1b[2J" + std::string(1000, 'a') + "\r\n");
    EXPECT_THAT(error, HasSubstr("\"\\x1B[2Ja"));
    EXPECT_LT(error.size(), 200U);
}

TEST(FrameReader, TakesNoMemoryForBytesThatDoNotCome) {
    // More than there is: an allocation of that size would throw something other than FramingError.
    const std::size_t promised = std::numeric_limits<std::size_t>::max() / 2;
    FrameReader reader(
        sourceOf("Channel: /a\r\nContent-Length: " + std::to_string(promised) + "\r\n\r\nabc"),
        std::numeric_limits<std::size_t>::max());
    EXPECT_THROW(reader.next(), FramingError);
}

TEST(FrameReader, PassesOnWhatItsSourceThrows) {
    FrameReader reader([](char*, std::size_t) -> std::size_t { throw std::out_of_range("gone"); },
                       maxPayload);
    EXPECT_THROW(reader.next(), std::out_of_range);
}

// Whatever comes, the reader ends with frames or a FramingError.
TEST(FrameReader, TakesAnyBytes) {
    std::mt19937 random(2);
    const std::string good = frame({"/a", "payload"}) + frame({"/b", std::string(300, 'b')});
    for (int run = 0; run < 20'000; ++run) {
        std::string bytes = good;
        for (unsigned change = random() % 4; change-- > 0 && !bytes.empty();) {
            const std::size_t at = random() % bytes.size();
            switch (random() % 3) {
                case 0:
                    bytes[at] = static_cast<char>(random());
                    break;
                case 1:
                    bytes.erase(at, random() % 10);
                    break;
                default:
                    bytes.insert(at, bytes, random() % bytes.size(), random() % 10);
            }
        }
        FrameReader reader(sourceOf(bytes, [&random] { return 1 + random() % 50; }), maxPayload);
        std::size_t total = 0;
        try {
            while (const std::optional<Frame> read = reader.next()) {
                total += read->channel.size() + read->payload.length();
            }
        } catch (const FramingError& error) {
            EXPECT_THAT(error.what(), HasSubstr("is not framed rightly: "));
        }
        EXPECT_LE(total, bytes.size());
    }
}

TEST(FrameHeaders, WriteTheChannelAndTheLength) {
    EXPECT_EQ(frameHeaders("/a", 12), "Channel: /a\r\nContent-Length: 12\r\n\r\n");
}

TEST(FrameHeaders, RefuseAChannelThatWouldNotBeReadBack) {
    EXPECT_THROW(frameHeaders("", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders(" /a", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders("\t/a", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders("/a\r\nContent-Length: 0", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders("/a\n", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders("/a\r", 1), std::invalid_argument);
    EXPECT_THROW(frameHeaders(std::string(maxHeaderLine - 8, 'a'), 1), std::invalid_argument);
}

}  // namespace
}  // namespace host
