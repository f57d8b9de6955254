// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/pieces.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

namespace platform::messaging::nats {
namespace {

void expectWord(std::string_view header, ClientWord::Kind kind, std::uint64_t number = 0) {
    const auto word = parseClientWord(header);
    ASSERT_TRUE(word) << header;
    EXPECT_EQ(word->kind, kind) << header;
    EXPECT_EQ(word->number, number) << header;
}

TEST(ClientWords, AreUnderstood) {
    expectWord("yes", ClientWord::Kind::yes);
    expectWord("stop", ClientWord::Kind::stop);
    expectWord("offer 300000000", ClientWord::Kind::offer, 300'000'000);
    expectWord("piece 0", ClientWord::Kind::piece, 0);
    expectWord("room 18446744073709551615", ClientWord::Kind::room, ~std::uint64_t{0});
}

TEST(ClientWords, AreNothingWhenTheyAreNotToTheLetter) {
    for (const std::string header : {"",
                                     " ",
                                     "no",
                                     "Yes",
                                     "yes ",
                                     " yes",
                                     "yes 1",
                                     "stop now",
                                     "offer",
                                     "offer ",
                                     "offer x",
                                     "offer -1",
                                     "offer +1",
                                     "offer 1 ",
                                     "offer  1",
                                     "offer 1 2",
                                     "offer 0x10",
                                     "offer 1.5",
                                     "offer 18446744073709551616",
                                     "room 1\n",
                                     "answer w 1",
                                     "piece"}) {
        EXPECT_FALSE(parseClientWord(header)) << '"' << header << '"';
    }
    EXPECT_FALSE(parseClientWord(std::string("yes\0", 4)));
}

TEST(ReturnAddresses, BelongToTheUserBeforeTheFirstDot) {
    EXPECT_EQ((ReturnAddress{"ada.7f-1.x", ""}).user(), "ada");
    EXPECT_EQ((ReturnAddress{"ada", ""}).user(), "ada");
}

}  // namespace
}  // namespace platform::messaging::nats
