// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/subject.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

namespace platform::messaging::nats {
namespace {

using testing::HasSubstr;

std::string flawOf(const std::string& channel) {
    try {
        requireSubject(channel);
    } catch (const std::invalid_argument& error) {
        return error.what();
    }
    return "";
}

TEST(Subject, MayBeAnyTextWithoutBlanks) {
    for (const std::string channel :
         {"/zpr/service/readRequest_cpp", "/zpr/service/readResponse/", "a", "a.b.c", "a*b", "a>b",
          "*a.b>", "/x/*", "$SYS.x", "\xC3\xA9\xE6\x97\xA5.\xF0\x9F\x98\x80", "a,b;c:\"d\"'{}\\"}) {
        EXPECT_EQ(flawOf(channel), "") << channel;
    }
}

TEST(Subject, IsNotEmpty) {
    EXPECT_EQ(flawOf(""), "Channel \"\" is no NATS subject: it is empty.");
}

TEST(Subject, HasNoBlanksAndControls) {
    for (int c = 0; c <= 0x20; ++c) {
        EXPECT_THAT(flawOf(std::string("a") + static_cast<char>(c) + "b"),
                    HasSubstr("it has a blank or a control character"))
            << c;
    }
    EXPECT_THAT(flawOf("a\x7F"), HasSubstr("it has a blank or a control character"));
    EXPECT_EQ(flawOf("x\r\nPUB y 1"),
              "Channel \"x\\x0D\\x0APUB y 1\" is no NATS subject: it has a blank or a control "
              "character.");
}

TEST(Subject, HasNoEmptyTokens) {
    for (const std::string channel : {".", ".a", "a.", "a..b", "/zpr/readResponse/.."}) {
        EXPECT_THAT(flawOf(channel), HasSubstr("nothing before, after or between its dots"))
            << channel;
    }
}

TEST(Subject, HasNoWildcards) {
    for (const std::string channel : {"*", ">", "a.*", "*.a", "a.>", "a.*.b"}) {
        EXPECT_THAT(flawOf(channel), HasSubstr("it has a wildcard between its dots")) << channel;
    }
}

TEST(Subject, IsUtf8) {
    for (const std::string channel : {"\xFF", "a\xC3", "\xED\xA0\x80", "\xC0\x80"}) {
        EXPECT_THAT(flawOf(channel), HasSubstr("it is not UTF-8")) << channel;
    }
}

TEST(Subject, HasALengthThatAServerTakes) {
    EXPECT_EQ(flawOf(std::string(4000, 'x')), "");
    EXPECT_THAT(flawOf(std::string(4001, 'x')), HasSubstr("it is longer than 4000 bytes"));
}

}  // namespace
}  // namespace platform::messaging::nats
