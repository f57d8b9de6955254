// SPDX-License-Identifier: Apache-2.0
// Messages in pieces, through a real server that takes none of them whole.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nats/nats.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <latch>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

#include "platform/messaging/channels.h"
#include "tests/platform/messaging/nats/bus_at_server.h"
#include "tests/platform/messaging/nats/transfers_support.h"

namespace platform::messaging {
namespace {

using nats::pieceSize;
using nats::randomBytes;
using testing::StartsWith;

constexpr const char* smallServer = "max_payload: 2MB\nmax_pending: 32MB";

void require(natsStatus status) {
    if (status != NATS_OK) {
        throw std::runtime_error(natsStatus_GetText(status));
    }
}

// A client that sends exactly what a test tells it to.
class PieceClient {
public:
    struct Heard {
        std::string subject;
        std::string word;  // of the header
        std::string payload;
    };

    explicit PieceClient(const test::NatsServer& server, const std::string& rtcId = "ada.1")
        : rtcId_(rtcId), answer_("/answer/" + rtcId) {
        require(natsConnection_ConnectTo(&connection_, server.url().c_str()));
        require(natsConnection_SubscribeSync(&answers_, connection_, answer_.c_str()));
        require(natsConnection_FlushTimeout(connection_, 10'000));
    }
    PieceClient(const PieceClient&) = delete;
    PieceClient& operator=(const PieceClient&) = delete;
    ~PieceClient() {
        natsSubscription_Destroy(answers_);
        natsConnection_Destroy(connection_);
    }

    void say(const std::string& subject, const std::string& word, std::string_view payload = "",
             const char* reply = nullptr) {
        natsMsg* message = nullptr;
        require(natsMsg_Create(&message, subject.c_str(),
                               reply != nullptr ? reply : answer_.c_str(), payload.data(),
                               static_cast<int>(payload.size())));
        natsMsgHeader_Set(message, "Zpr-Pieces", word.c_str());
        const natsStatus status = natsConnection_PublishMsg(connection_, message);
        natsMsg_Destroy(message);
        require(status);
    }

    std::optional<Heard> hear(std::chrono::milliseconds patience = longestWait) {
        natsMsg* received = nullptr;
        if (natsSubscription_NextMsg(&received, answers_, patience.count()) != NATS_OK) {
            return std::nullopt;
        }
        const char* word = nullptr;
        if (natsMsgHeader_Get(received, "Zpr-Pieces", &word) != NATS_OK) {
            word = "";
        }
        Heard heard{
            natsMsg_GetSubject(received),
            word,
            {natsMsg_GetData(received), static_cast<std::size_t>(natsMsg_GetDataLength(received))}};
        natsMsg_Destroy(received);
        return heard;
    }

    // Sends `request` in pieces, as there is room. Returns what is heard when it is not for more.
    Heard send(const std::string& request, const std::string& channel = "/ask/offer") {
        say(channel, "offer " + std::to_string(request.size()));
        std::size_t sent = 0;
        for (;;) {
            const Heard heard = hear().value();
            if (!heard.word.starts_with("room ")) {
                return heard;
            }
            worker_ = heard.word.substr(5, heard.word.rfind(' ') - 5);
            const std::size_t end = std::stoul(heard.word.substr(heard.word.rfind(' ')));
            for (; sent < end; sent += std::min(pieceSize, request.size() - sent)) {
                say(pieces(), "piece " + std::to_string(sent),
                    std::string_view(request).substr(sent, pieceSize));
            }
        }
    }

    // Fetches the answer that `announced` announces.
    std::string take(const Heard& announced) {
        worker_ = announced.word.substr(7, announced.word.rfind(' ') - 7);
        const std::size_t length = std::stoul(announced.word.substr(announced.word.rfind(' ')));
        std::string answer;
        while (answer.size() < length) {
            say(pieces(), "room " + std::to_string(answer.size() + 2 * pieceSize));
            Heard heard = hear().value();
            if (heard.word != "piece " + std::to_string(answer.size())) {
                return heard.word;
            }
            answer += heard.payload;
        }
        return answer;
    }

    std::string pieces() const { return piecesPrefix + worker_ + "." + rtcId_; }

private:
    std::string rtcId_;
    std::string answer_;
    natsConnection* connection_ = nullptr;
    natsSubscription* answers_ = nullptr;
    std::string worker_;
};

NatsOptions longOptions(const test::NatsServer& server) {
    NatsOptions options = optionsFor(server);
    options.longMessages.answerPrefixes = {{"/ask", "/answer/"}};
    return options;
}

// Answers requests on "/ask" with `answer`.
struct Worker : BusAtServer {
    explicit Worker(const test::NatsServer& server, std::string text = "done")
        : BusAtServer(longOptions(server)),
          answer(std::move(text)),
          subscription(subscribe("/ask", [this](const JsonMessage& request) {
              requests.add(textOf(request));
              publish("/answer/ada.1", answer);
          })) {}

    const std::string answer;
    Inbox<std::string> requests;
    std::shared_ptr<Subscription> subscription;
};

TEST(NatsLongMessages, ComeAndGoByteForByte) {
    const test::NatsServer server(smallServer);
    const std::string request = randomBytes(50 * pieceSize + 17);
    Worker worker(server, randomBytes(40 * pieceSize + 3));
    PieceClient client(server);
    const auto announced = client.send(request);
    EXPECT_THAT(announced.word, StartsWith("answer "));
    EXPECT_TRUE(client.take(announced) == worker.answer);
    const auto handled = worker.requests.waitFor(1);
    ASSERT_EQ(handled.size(), 1U);
    EXPECT_TRUE(handled[0] == request);
}

TEST(NatsLongMessages, GoToAClientWhoseShortRequestSaysThatItTakesThem) {
    const test::NatsServer server(smallServer);
    Worker worker(server, randomBytes(3 * pieceSize));
    PieceClient client(server);
    client.say("/ask", "yes", "short");
    EXPECT_TRUE(client.take(client.hear().value()) == worker.answer);
    EXPECT_THAT(worker.requests.items(), testing::ElementsAre("short"));
}

TEST(NatsLongMessages, MayBeAsLongAsTheirClientTakesThem) {
    const test::NatsServer server(smallServer);
    BusAtServer bus(longOptions(server));
    Inbox<std::size_t> longest;
    const auto subscription = bus.subscribe(
        "/ask", [&](const JsonMessage&) { longest.add(bus.client->maxPayload("/answer/ada.1")); });
    PieceClient client(server);
    client.say("/ask", "yes", "short");
    longest.waitFor(1);
    BusAtServer(server).publish("/ask", "short");
    EXPECT_THAT(longest.waitFor(2), testing::ElementsAre(1UL << 30U, 2UL << 20U));
}

TEST(NatsLongMessages, AreShortOnesAsEverWhenTheyAreShort) {
    const test::NatsServer server(smallServer);
    Worker worker(server, "short");
    PieceClient client(server);
    client.say("/ask", "yes", "?");
    const auto heard = client.hear().value();
    EXPECT_EQ(heard.word, "");
    EXPECT_EQ(heard.payload, "short");
}

TEST(NatsLongMessages, GoToNobodyWhoHasNotSaidThatHeTakesThem) {
    BusLog& log = BusLog::start();
    const test::NatsServer server(smallServer);
    Worker worker(server, randomBytes(3 * pieceSize));
    PieceClient client(server);
    BusAtServer(server).publish("/ask", "short");
    EXPECT_TRUE(log.waitFor("was not published: The server takes messages of up to"));
    EXPECT_FALSE(client.hear(std::chrono::milliseconds(50)));
}

TEST(NatsLongMessages, AreNotHandledInPart) {
    const test::NatsServer server(smallServer);
    Worker worker(server);
    PieceClient client(server);
    const std::string request = randomBytes(3 * pieceSize);
    client.say("/ask/offer", "offer " + std::to_string(request.size()));
    const std::string room = client.hear().value().word;
    const std::string pieces = piecesPrefix + room.substr(5, room.rfind(' ') - 5) + ".ada.1";
    client.say(pieces, "piece 0", request.substr(0, pieceSize));
    client.say(pieces, "piece 2097152", request.substr(2 * pieceSize));
    EXPECT_EQ(client.hear().value().word, "stop a piece is out of turn");
    EXPECT_EQ(client.send(request).payload, "done") << "on asking again";
    EXPECT_EQ(worker.requests.items().size(), 1U);
}

TEST(NatsLongMessages, GoNowhereButWhereAnswersDo) {
    const test::NatsServer server(smallServer);
    Worker worker(server);
    BusAtServer victim(server);
    Inbox<std::string> deceived;
    const auto subscription = victim.collect("/victim", deceived);
    PieceClient client(server);
    for (const char* reply : {"/victim", "/answer/", "/answer/a..b", "/answer/*"}) {
        client.say("/ask/offer", "offer 3000000", "", reply);
    }
    EXPECT_EQ(client.send(randomBytes(2 * pieceSize)).payload, "done");
    victim.publish("/victim", "genuine");
    EXPECT_THAT(deceived.waitFor(1), testing::ElementsAre("genuine"));
}

// Short requests and those in pieces come from different threads.
TEST(NatsLongMessages, AreHandledOneAtATimeWithTheShortOnes) {
    const test::NatsServer server(smallServer);
    BusAtServer bus(longOptions(server));
    std::atomic<int> running = 0;
    std::atomic<bool> overlap = false;
    Inbox<std::string> requests;
    const auto subscription = bus.subscribe("/ask", [&](const JsonMessage& request) {
        overlap = overlap || ++running != 1;
        std::this_thread::sleep_for(std::chrono::milliseconds(2));  // time to overlap
        --running;
        requests.add(textOf(request).substr(0, 5));
        if (request.payload().size() > 5) {
            bus.publish("/answer/ada.1", "done");
        }
    });
    PieceClient client(server);
    for (int round = 0; round < 10; ++round) {
        for (int each = 0; each < 5; ++each) {
            client.say("/ask", "yes", "short");
        }
        EXPECT_EQ(client.send(std::string(pieceSize + 1, 'x')).payload, "done");
    }
    EXPECT_EQ(requests.waitFor(60).size(), 60U);
    EXPECT_FALSE(overlap);
}

TEST(NatsLongMessages, LetASubscriptionEndInsideItsHandler) {
    const test::NatsServer server(smallServer);
    BusAtServer bus(longOptions(server));
    std::latch ended(1);
    std::shared_ptr<Subscription> subscription;
    std::atomic<bool> ready = false;
    subscription = bus.subscribe("/ask", [&](const JsonMessage&) {
        while (!ready) {
            std::this_thread::yield();
        }
        subscription.reset();
        ended.count_down();
    });
    ready = true;
    PieceClient client(server);
    client.say("/ask", "yes", "short");
    ended.wait();
}

TEST(NatsLongMessages, AreTakenBeforeTheBusEnds) {
    const test::NatsServer server(smallServer);
    Worker worker(server, randomBytes(9 * pieceSize));
    PieceClient client(server);
    client.say("/ask", "yes", "short");
    const auto announced = client.hear().value();
    std::atomic<bool> drained = false;
    std::jthread drain([&] { drained = worker.bus->drain(longestWait); });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));  // time for a hasty drain
    EXPECT_FALSE(drained);
    EXPECT_TRUE(client.take(announced) == worker.answer);
    drain.join();
    EXPECT_TRUE(drained);
}

TEST(NatsLongMessages, AreOfferedElsewhereWhenTheBusEnds) {
    const test::NatsServer server(smallServer);
    Worker worker(server);
    PieceClient client(server);
    client.say("/ask/offer", "offer 3000000");
    EXPECT_THAT(client.hear().value().word, StartsWith("room "));
    EXPECT_TRUE(worker.bus->drain(longestWait));
    EXPECT_EQ(client.hear().value().word, "stop this worker ends");
}

TEST(NatsLongMessages, ComeAgainAfterTheServerHasFailed) {
    test::NatsServer server(smallServer);
    Worker worker(server);
    {
        PieceClient client(server);
        client.say("/ask/offer", "offer 3000000");
        EXPECT_THAT(client.hear().value().word, StartsWith("room "));
    }
    server.kill();
    server.start();
    // The connections are made again one after the other. Another user's request need not wait
    // until the half that came before has stood still for too long.
    const std::string request = randomBytes(2 * pieceSize);
    for (;;) {
        PieceClient client(server, "ben.1");
        client.say("/ask/offer", "offer " + std::to_string(request.size()));
        const auto heard = client.hear(std::chrono::milliseconds(500));
        if (heard && heard->word.starts_with("room ")) {
            break;
        }
    }
    EXPECT_TRUE(worker.requests.items().empty()) << "nothing of the half that came before";
}

}  // namespace
}  // namespace platform::messaging
