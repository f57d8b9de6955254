// SPDX-License-Identifier: Apache-2.0
// Answers that leave in pieces, without a server: what is said, and what is to be said back.
#include "platform/messaging/nats/outgoing_transfers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "tests/platform/messaging/nats/transfers_support.h"

namespace platform::messaging::nats {
namespace {

using std::chrono::seconds;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* untaken = "stop the answer was not taken for too long";

class OutgoingTransfersTest : public testing::Test {
protected:
    Notes answer(const std::string& id, std::size_t size) {
        return transfers.answer(address(id), DataBuffer::copyOf(randomBytes(size)), now);
    }
    Notes room(const std::string& id, std::uint64_t end) { return transfers.room(id, end, now); }

    TestMemory memory{64 * pieceSize};
    Time now = Time(std::chrono::hours(1));
    OutgoingTransfers transfers{"w1", memory.reserve()};
};

TEST_F(OutgoingTransfersTest, SendsAllOfAnAnswerAsThereIsRoom) {
    const std::size_t size = 9 * pieceSize + 17;
    EXPECT_THAT(said(answer("ada.1", size)), ElementsAre("/answers/ada.1: answer w1 9437201"));
    std::string received;
    while (received.size() < size) {
        const Notes notes = room("ada.1", received.size() + 2 * pieceSize);
        ASSERT_FALSE(notes.empty());
        for (const Note& note : notes) {
            EXPECT_EQ(note.subject, "/answers/ada.1");
            EXPECT_EQ(note.word, "piece " + std::to_string(received.size()));
            EXPECT_LE(note.payload.size(), pieceSize);
            received += note.payload;
        }
        EXPECT_LE(notes.size(), 2U);
    }
    EXPECT_TRUE(received == randomBytes(size));
    EXPECT_EQ(transfers.count(), 0U);
    EXPECT_EQ(memory.used(), 0U);
}

TEST_F(OutgoingTransfersTest, SendsNothingBeforeThereIsRoom) {
    answer("ada.1", 3 * pieceSize);
    EXPECT_THAT(room("ada.1", 0), IsEmpty());
    EXPECT_THAT(room("ben.1", 100), IsEmpty());
}

TEST_F(OutgoingTransfersTest, SendsNothingTwice) {
    answer("ada.1", 3 * pieceSize);
    EXPECT_THAT(said(room("ada.1", 100)), ElementsAre("/answers/ada.1: piece 0"));
    EXPECT_THAT(room("ada.1", 100), IsEmpty());
    EXPECT_THAT(room("ada.1", 50), IsEmpty());
    EXPECT_THAT(said(room("ada.1", 101)), ElementsAre("/answers/ada.1: piece 100"));
}

TEST_F(OutgoingTransfersTest, SendsNoMoreThanAWindowAtOnceWhateverRoomIsClaimed) {
    answer("ada.1", 10 * pieceSize);
    EXPECT_EQ(room("ada.1", ~std::uint64_t{0}).size(), windowSize / pieceSize);
}

TEST_F(OutgoingTransfersTest, KeepsThePayloadOfPiecesThatAreNotSentYet) {
    answer("ada.1", 3 * pieceSize);
    Notes notes = room("ada.1", 3 * pieceSize);
    EXPECT_EQ(transfers.count(), 0U);
    EXPECT_EQ(memory.used(), 3 * pieceSize);
    std::string received;
    for (const Note& note : notes) {
        received += note.payload;
    }
    EXPECT_TRUE(received == randomBytes(3 * pieceSize));
    notes.clear();
    EXPECT_EQ(memory.used(), 0U);
}

TEST_F(OutgoingTransfersTest, DropsASecondAnswerToOneRequest) {
    answer("ada.1", 3 * pieceSize);
    EXPECT_THAT(answer("ada.1", 2 * pieceSize), IsEmpty());
    EXPECT_EQ(memory.used(), 3 * pieceSize);
}

TEST_F(OutgoingTransfersTest, StopsWhenTheClientDoes) {
    answer("ada.1", 3 * pieceSize);
    transfers.stop("ada.1");
    transfers.stop("ada.1");
    EXPECT_EQ(memory.used(), 0U);
    EXPECT_THAT(room("ada.1", 100), IsEmpty());
}

TEST_F(OutgoingTransfersTest, GivesUpWhatStandsStill) {
    answer("ada.1", 3 * pieceSize);
    now += seconds(20);
    room("ada.1", pieceSize);
    now += seconds(29);
    EXPECT_THAT(transfers.tick(now), IsEmpty());
    now += seconds(1);
    EXPECT_THAT(said(transfers.tick(now)), ElementsAre(std::string("/answers/ada.1: ") + untaken));
    EXPECT_EQ(memory.used(), 0U);
}

TEST_F(OutgoingTransfersTest, TakesAByteNowAndThenForStandingStill) {
    answer("eve.1", 3 * pieceSize);
    for (std::uint64_t end = 1; end < 30; ++end) {
        now += seconds(1);
        room("eve.1", end);
    }
    now += seconds(1);
    EXPECT_EQ(transfers.tick(now).size(), 1U);
}

TEST_F(OutgoingTransfersTest, GivesUpWhatStandsStillForWhoNeedsTheMemory) {
    answer("ada.1", 30 * pieceSize);
    answer("ada.2", 30 * pieceSize);
    now += seconds(5);
    room("ada.1", pieceSize);
    EXPECT_THAT(said(answer("ada.3", 20 * pieceSize)),
                ElementsAre(std::string("/answers/ada.2: ") + untaken,
                            "/answers/ada.3: answer w1 20971520"));
}

TEST_F(OutgoingTransfersTest, HasAClientAskAgainWhileThereIsNoMemory) {
    answer("ada.1", 60 * pieceSize);
    EXPECT_THAT(said(answer("ada.2", 20 * pieceSize)),
                ElementsAre("/answers/ada.2: stop too many answers wait to be taken"));
    EXPECT_EQ(memory.used(), 60 * pieceSize);
}

TEST_F(OutgoingTransfersTest, GivesUpTheAnswersOfWhoHasMoreThanHisShare) {
    for (int each = 0; each < 6; ++each) {
        answer("eve." + std::to_string(each), 10 * pieceSize);
        now += std::chrono::milliseconds(1);
    }
    EXPECT_THAT(said(answer("ada.1", 20 * pieceSize)),
                ElementsAre(std::string("/answers/eve.0: ") + untaken,
                            std::string("/answers/eve.1: ") + untaken,
                            "/answers/ada.1: answer w1 20971520"));
    EXPECT_THAT(said(answer("eve.9", 10 * pieceSize)),
                ElementsAre("/answers/eve.9: stop too many answers wait to be taken"));
}

TEST_F(OutgoingTransfersTest, EndsAllAtOnce) {
    answer("ada.1", 3 * pieceSize);
    answer("ben.1", 3 * pieceSize);
    EXPECT_EQ(transfers.stopAll("so long").size(), 2U);
    EXPECT_EQ(memory.used(), 0U);
}

}  // namespace
}  // namespace platform::messaging::nats
