// SPDX-License-Identifier: Apache-2.0
// Requests that come in pieces, without a server: what is said, and what is to be said back.
#include "platform/messaging/nats/incoming_transfers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <random>
#include <string>
#include <vector>

#include "tests/platform/messaging/nats/transfers_support.h"

namespace platform::messaging::nats {
namespace {

using std::chrono::seconds;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

class IncomingTransfersTest : public testing::Test {
protected:
    Notes offer(const std::string& id, std::uint64_t length) {
        return transfers.offer("/write", address(id), length, now);
    }
    IncomingTransfers::Progress piece(const std::string& id, std::uint64_t offset,
                                      const std::string& bytes) {
        return transfers.piece(id, offset, bytes, now);
    }
    // Sends `bytes` in pieces as far as there is room, and more when there is more.
    IncomingTransfers::Progress sendAll(const std::string& id, const std::string& bytes) {
        IncomingTransfers::Progress last;
        for (std::size_t sent = 0; sent < bytes.size(); sent += pieceSize) {
            last = piece(id, sent, bytes.substr(sent, pieceSize));
        }
        return last;
    }

    TestMemory memory{64 * pieceSize};
    Time now = Time(std::chrono::hours(1));
    IncomingTransfers transfers{"w1",
                                {.longestRequest = 64 * pieceSize,
                                 .mostOffers = 8,
                                 .mostOffersOfAUser = 4,
                                 .mostAhead = 64 * pieceSize},
                                memory.reserve()};
};

TEST_F(IncomingTransfersTest, HandsOnARequestThatHasComeWhole) {
    const std::string bytes = randomBytes(10 * pieceSize + 17);
    EXPECT_THAT(said(offer("ada.1", bytes.size())), ElementsAre("/answers/ada.1: room w1 4194304"));
    const auto last = sendAll("ada.1", bytes);
    ASSERT_TRUE(last.request);
    EXPECT_EQ(last.request->channel, "/write");
    EXPECT_EQ(last.request->address.channel, "/answers/ada.1");
    EXPECT_TRUE(last.request->payload->view() == bytes);
    EXPECT_EQ(transfers.count(), 0U);
    EXPECT_EQ(memory.used(), bytes.size()) << "until the request is handled";
}

TEST_F(IncomingTransfersTest, GivesRoomAsPiecesCome) {
    offer("ada.1", 10 * pieceSize);
    const std::string bytes(pieceSize, 'x');
    EXPECT_THAT(said(piece("ada.1", 0, bytes).notes),
                ElementsAre("/answers/ada.1: room w1 5242880"));
    EXPECT_THAT(said(piece("ada.1", pieceSize, bytes).notes),
                ElementsAre("/answers/ada.1: room w1 6291456"));
}

TEST_F(IncomingTransfersTest, GivesRoomOnceInAWhileForSmallPieces) {
    offer("ada.1", 10 * pieceSize);
    std::size_t notes = 0;
    for (std::size_t sent = 0; sent < 4 * pieceSize; sent += 1024) {
        notes += piece("ada.1", sent, std::string(1024, 'x')).notes.size();
    }
    EXPECT_EQ(notes, 4U);
}

TEST_F(IncomingTransfersTest, TellsTheSameOfferItsRoomAgain) {
    offer("ada.1", 3 * pieceSize);
    piece("ada.1", 0, "abc");
    EXPECT_THAT(said(offer("ada.1", 3 * pieceSize)),
                ElementsAre("/answers/ada.1: room w1 3145728"));
    EXPECT_EQ(memory.used(), 3 * pieceSize);
    EXPECT_THAT(said(offer("ada.1", 3)),
                ElementsAre("/answers/ada.1: stop another offer has this id"));
    EXPECT_EQ(transfers.count(), 1U);
}

TEST_F(IncomingTransfersTest, RefusesLengthsThatNoRequestHas) {
    for (const std::uint64_t length :
         {std::uint64_t{0}, std::uint64_t{64 * pieceSize + 1}, ~std::uint64_t{0}}) {
        EXPECT_THAT(said(offer("ada.1", length)),
                    ElementsAre("/answers/ada.1: stop requests have 1 to 67108864 bytes"));
    }
    EXPECT_EQ(transfers.count(), 0U);
}

struct BadPiece {
    const char* name;
    std::uint64_t offset;
    std::size_t size;
};

class BadPieces : public IncomingTransfersTest, public testing::WithParamInterface<BadPiece> {};

TEST_P(BadPieces, EndTheTransferAndFreeItsMemory) {
    offer("ada.1", 9 * pieceSize);
    piece("ada.1", 0, std::string(1000, 'x'));
    const auto progress = piece("ada.1", GetParam().offset, std::string(GetParam().size, 'y'));
    EXPECT_THAT(said(progress.notes), ElementsAre("/answers/ada.1: stop a piece is out of turn"));
    EXPECT_FALSE(progress.request);
    EXPECT_EQ(transfers.count(), 0U);
    EXPECT_EQ(memory.used(), 0U);
    EXPECT_THAT(piece("ada.1", 1000, "z").notes, IsEmpty()) << "nothing is left of it";
}

INSTANTIATE_TEST_SUITE_P(IncomingTransfersTest, BadPieces,
                         testing::Values(BadPiece{"Twice", 0, 1000}, BadPiece{"Missing", 1001, 10},
                                         BadPiece{"Empty", 1000, 0},
                                         BadPiece{"TooLong", 1000, pieceSize + 1},
                                         BadPiece{"FarAway", ~std::uint64_t{0}, 10}),
                         [](const auto& tested) { return tested.param.name; });

TEST_F(IncomingTransfersTest, EndsAtAPieceThatIsPastTheRoom) {
    offer("ada.1", 4);
    EXPECT_THAT(said(piece("ada.1", 0, "abcde").notes),
                ElementsAre("/answers/ada.1: stop a piece is out of turn"));
}

TEST_F(IncomingTransfersTest, TakesNothingBeforeThereIsRoom) {
    offer("ada.1", 64 * pieceSize);
    EXPECT_THAT(said(offer("ada.2", 10)), ElementsAre("/answers/ada.2: room w1 0"));
    EXPECT_THAT(said(piece("ada.2", 0, "abc").notes),
                ElementsAre("/answers/ada.2: stop a piece is out of turn"));
    EXPECT_EQ(memory.used(), 64 * pieceSize);
}

TEST_F(IncomingTransfersTest, DropsPiecesThatBelongToNoOffer) {
    EXPECT_THAT(piece("ada.1", 0, "abc").notes, IsEmpty());
    EXPECT_EQ(transfers.count(), 0U);
}

TEST_F(IncomingTransfersTest, AdmitsTheNextWhenThereIsRoom) {
    const std::string bytes(40 * pieceSize, 'x');
    offer("ada.1", bytes.size());
    EXPECT_THAT(said(offer("ben.1", 30 * pieceSize)), ElementsAre("/answers/ben.1: room w1 0"));
    auto last = sendAll("ada.1", bytes);
    ASSERT_TRUE(last.request);
    EXPECT_THAT(transfers.admitWaiting(now), IsEmpty()) << "the request has not been handled";
    last.request.reset();
    EXPECT_THAT(said(transfers.admitWaiting(now)), ElementsAre("/answers/ben.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, LetsUsersTakeTurns) {
    offer("eve.1", 60 * pieceSize);
    for (const char* id : {"eve.2", "eve.3", "eve.4"}) {
        offer(id, 10 * pieceSize);
    }
    offer("ben.1", 10 * pieceSize);
    offer("ada.1", 10 * pieceSize);
    EXPECT_THAT(said(transfers.stop("eve.1", now)),
                ElementsAre("/answers/ada.1: room w1 4194304", "/answers/ben.1: room w1 4194304",
                            "/answers/eve.2: room w1 4194304", "/answers/eve.3: room w1 4194304",
                            "/answers/eve.4: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, AdmitsWhatFitsWhileALargerOneWaits) {
    offer("ada.1", 40 * pieceSize);
    EXPECT_THAT(said(offer("eve.1", 64 * pieceSize)), ElementsAre("/answers/eve.1: room w1 0"));
    EXPECT_THAT(said(offer("ben.1", 10 * pieceSize)),
                ElementsAre("/answers/ben.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, LetsNobodyOvertakeAnOfferForEver) {
    offer("ada.1", 40 * pieceSize);
    offer("eve.1", 64 * pieceSize);
    now += longestOvertaking - seconds(1);
    EXPECT_THAT(said(offer("ben.1", 10 * pieceSize)),
                ElementsAre("/answers/ben.1: room w1 4194304"));
    now += seconds(1);
    EXPECT_THAT(said(offer("cem.1", 10 * pieceSize)), ElementsAre("/answers/cem.1: room w1 0"));
    EXPECT_THAT(transfers.stop("ben.1", now), IsEmpty());
    EXPECT_THAT(said(transfers.stop("ada.1", now)), ElementsAre("/answers/eve.1: room w1 4194304"));
    EXPECT_THAT(said(transfers.stop("eve.1", now)), ElementsAre("/answers/cem.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, LetsNobodyShutOthersOutWithManyOffers) {
    for (const char* id : {"eve.1", "eve.2", "eve.3", "eve.4"}) {
        offer(id, 64 * pieceSize);
    }
    now += seconds(3);
    offer("ben.1", 64 * pieceSize);
    now += longestOvertaking;
    EXPECT_THAT(said(transfers.stop("eve.1", now)), ElementsAre("/answers/eve.2: room w1 4194304"));
    EXPECT_THAT(said(transfers.stop("eve.2", now)), ElementsAre("/answers/ben.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, BoundsTheOffersOfAUserAndOfAll) {
    for (const char* id : {"eve.1", "eve.2", "eve.3", "eve.4"}) {
        offer(id, 64 * pieceSize);
    }
    EXPECT_THAT(said(offer("eve.5", 1)), ElementsAre("/answers/eve.5: stop too many offers wait"));
    for (const char* id : {"ada.1", "ben.1", "cem.1", "dan.1"}) {
        EXPECT_THAT(said(offer(id, 1)), ElementsAre(testing::HasSubstr("room")));
    }
    EXPECT_THAT(said(offer("fay.1", 1)), ElementsAre("/answers/fay.1: stop too many offers wait"));
    transfers.stop("eve.4", now);
    EXPECT_THAT(said(offer("fay.1", 1)), ElementsAre(testing::HasSubstr("room")));
}

TEST_F(IncomingTransfersTest, RemindsThoseWhoWait) {
    offer("ada.1", 64 * pieceSize);
    offer("ben.1", 64 * pieceSize);
    now += seconds(4);
    piece("ada.1", 0, std::string(pieceSize, 'x'));
    EXPECT_THAT(transfers.tick(now), IsEmpty());
    now += seconds(1);
    EXPECT_THAT(said(transfers.tick(now)), ElementsAre("/answers/ben.1: room w1 0"));
    EXPECT_THAT(transfers.tick(now), IsEmpty());
}

TEST_F(IncomingTransfersTest, EndsWhatStandsStill) {
    offer("ada.1", 40 * pieceSize);
    now += seconds(29);
    EXPECT_THAT(transfers.tick(now), IsEmpty());
    now += seconds(1);
    EXPECT_THAT(said(transfers.tick(now)),
                ElementsAre("/answers/ada.1: stop nothing came for too long"));
    EXPECT_EQ(memory.used(), 0U);
}

TEST_F(IncomingTransfersTest, EndsWhatStandsStillSoonerWhenItIsInTheWay) {
    offer("eve.1", 64 * pieceSize);
    offer("ada.1", 64 * pieceSize);
    now += seconds(5);
    EXPECT_THAT(said(transfers.tick(now)),
                UnorderedElementsAre("/answers/ada.1: room w1 0",
                                     "/answers/eve.1: stop nothing came for too long",
                                     "/answers/ada.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, TakesAByteNowAndThenForStandingStill) {
    offer("eve.1", 64 * pieceSize);
    offer("ada.1", 64 * pieceSize);
    for (std::uint64_t offset = 0; offset < 4; ++offset) {
        now += seconds(1);
        piece("eve.1", offset, "x");
        transfers.tick(now);
    }
    EXPECT_EQ(transfers.count(), 2U);
    now += seconds(1);
    transfers.tick(now);
    EXPECT_EQ(transfers.count(), 1U);
}

TEST_F(IncomingTransfersTest, BoundsWhatAllMayBeAheadTogether) {
    IncomingTransfers bounded("w1", {.mostAhead = 6 * pieceSize}, memory.reserve());
    EXPECT_THAT(said(bounded.offer("/write", address("ada.1"), 10 * pieceSize, now)),
                ElementsAre("/answers/ada.1: room w1 4194304"));
    EXPECT_THAT(said(bounded.offer("/write", address("ben.1"), 10 * pieceSize, now)),
                ElementsAre("/answers/ben.1: room w1 0"));
    EXPECT_THAT(said(bounded.stop("ada.1", now)), ElementsAre("/answers/ben.1: room w1 4194304"));
}

TEST_F(IncomingTransfersTest, EndsAllAtOnce) {
    offer("ada.1", 64 * pieceSize);
    offer("ben.1", 1);
    EXPECT_THAT(
        said(transfers.stopAll("so long")),
        UnorderedElementsAre("/answers/ada.1: stop so long", "/answers/ben.1: stop so long"));
    EXPECT_EQ(memory.used(), 0U);
    EXPECT_THAT(said(offer("ada.2", 1)), ElementsAre("/answers/ada.2: room w1 1"));
}

// Whatever clients say, in whatever order: memory is counted right, and what is handed on is what
// was sent.
TEST_F(IncomingTransfersTest, KeepsItsBooksWhateverIsSaid) {
    std::mt19937 random(20);
    const auto below = [&](std::size_t bound) { return random() % bound; };
    std::vector<WholeRequest> handled;
    for (int step = 0; step < 100; ++step) {
        const std::string id =
            std::string(1, static_cast<char>('a' + below(3))) + "." + std::to_string(below(3));
        switch (below(12)) {
            case 0:
            case 1:
                offer(id, below(3) * pieceSize * below(30) + below(3));
                break;
            case 2:
                transfers.stop(id, now);
                break;
            case 3:
                now += seconds(below(3));
                transfers.tick(now);
                break;
            case 4:
                handled.clear();
                transfers.admitWaiting(now);
                break;
            default:
                for (std::uint64_t offset = 0, size = 0; offset < 40 * pieceSize; offset += size) {
                    size = below(200) == 0 ? below(2 * pieceSize) : pieceSize;
                    auto progress = piece(id, offset, std::string(size, 'x'));
                    if (progress.request) {
                        handled.push_back(std::move(*progress.request));
                    }
                    if (below(20) == 0) {
                        break;
                    }
                }
        }
        std::size_t kept = 0;
        for (const WholeRequest& request : handled) {
            kept += request.payload->length();
        }
        ASSERT_GE(memory.used(), kept);
        ASSERT_LE(memory.used(), memory.size());
    }
    handled.clear();
    transfers.stopAll("the end");
    EXPECT_EQ(memory.used(), 0U);
    EXPECT_EQ(transfers.count(), 0U);
}

}  // namespace
}  // namespace platform::messaging::nats
