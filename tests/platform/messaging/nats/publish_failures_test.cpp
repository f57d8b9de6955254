// SPDX-License-Identifier: Apache-2.0
// Messages that cannot be published: the future says so, the log too, and the connection stands.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <latch>

#include <string>
#include <vector>

#include "platform/messaging/channels.h"
#include "tests/platform/messaging/nats/bus_at_server.h"

namespace platform::messaging {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;

TEST(NatsPublish, RefusesAMessageThatTheServerWouldNotTake) {
    BusLog& log = BusLog::start();
    const test::NatsServer server("max_payload: 1000");
    BusAtServer bus(server);
    Inbox<std::string> texts;
    const auto subscription = bus.collect("/big", texts);
    EXPECT_THAT(failureOf([&] { bus.publish("/big", std::string(1001, 'x')); }),
                AllOf(HasSubstr("A message of 1001 bytes on channel \"/big\" was not published"),
                      HasSubstr("up to 1000 bytes")));
    bus.publish("/big", std::string(1000, 'y'));
    EXPECT_THAT(texts.waitFor(1), ElementsAre(std::string(1000, 'y')));
    EXPECT_EQ(log.count("A message of 1001 bytes on channel \"/big\" was not published: The server "
                        "takes messages of up to 1000 bytes."),
              1);
    EXPECT_EQ(log.count("lost"), 0);
}

TEST(NatsPublish, KnowsTheLongestPayloadThatTheServerTakes) {
    const test::NatsServer server("max_payload: 1000");
    NatsOptions options;
    options.servers = {server.url()};
    const auto bus = NatsBus::create(options);
    const auto client = bus->connect("client").get();
    EXPECT_EQ(client->maxPayload("/any"), 1000u);
    bus->drain(std::chrono::seconds(5));
    // Publishing says what is wrong; the length is not.
    EXPECT_GT(client->maxPayload("/any"), 1000u);
}

TEST(NatsPublish, RefusesChannelsThatAreNoSubjects) {
    BusLog& log = BusLog::start();
    const test::NatsServer server;
    BusAtServer bus(server);
    const std::vector<std::string> channels = {"",
                                               " ",
                                               "a b",
                                               "a\tb",
                                               "\n",
                                               "a.",
                                               ".a",
                                               "a..b",
                                               "*",
                                               "a.*",
                                               ">",
                                               "a.>",
                                               "\xFF",
                                               std::string("a\0b", 3),
                                               std::string(5000, 'x')};
    for (const std::string& channel : channels) {
        EXPECT_THAT(
            failureOf([&] { bus.publish(channel, "x"); }),
            AllOf(HasSubstr("A message of 1 bytes on channel"), HasSubstr("is no NATS subject")));
        EXPECT_THAT(failureOf([&] { bus.subscribe(channel, [](const JsonMessage&) {}); }),
                    HasSubstr("is no NATS subject"));
    }
    EXPECT_EQ(log.count("was not published"), static_cast<long>(channels.size()));
    Inbox<std::string> texts;
    const auto subscription = bus.collect("a", texts);
    bus.publish("a", "still connected");
    EXPECT_THAT(texts.waitFor(1), ElementsAre("still connected"));
    EXPECT_EQ(log.count("lost"), 0);
}

// A request's rtcId becomes a part of the channel that is answered on.
TEST(NatsPublish, LetsNoChannelSmuggleProtocolLinesIn) {
    BusLog& log = BusLog::start();
    const test::NatsServer server;
    BusAtServer bus(server);
    BusAtServer victim(server);
    Inbox<std::string> stolen;
    const auto subscription = victim.collect("victim", stolen);
    for (const std::string id :
         {"x 0\r\n\r\nPUB victim 6\r\nforged\r\n", "x\nPUB victim 6\r\nforged\r\n",
          "x\rPUB victim 6", "x victim 6", "x\tvictim", "x 6\r\nforged\r\nSUB > 1\r\n",
          "x\r\n-ERR 'gone'\r\n", "\r\nPING\r\n"}) {
        EXPECT_THAT(failureOf([&] { bus.publish(readResponsePrefix + id, "forged"); }),
                    HasSubstr("blank or a control character"))
            << id;
    }
    // Were anything forged, it would come before this.
    bus.publish("victim", "genuine");
    EXPECT_THAT(stolen.waitFor(1), ElementsAre("genuine"));
    EXPECT_EQ(log.count("\n"), 0) << "no forged log lines either";
}

TEST(NatsPublish, TakesTheLongestSubject) {
    BusLog& log = BusLog::start();
    const test::NatsServer server;
    BusAtServer bus(server);
    BusAtServer other(server);
    Inbox<std::string> texts;
    const std::string channel(4000, 'x');
    const auto subscription = other.collect(channel, texts);
    const std::string payload(1'000'000, 'y');
    bus.publish(channel, payload);
    EXPECT_THAT(texts.waitFor(1), ElementsAre(payload));
    EXPECT_EQ(log.count("lost"), 0);
}

TEST(NatsPublish, TellsWhatTheServerDoesNotPermit) {
    BusLog& log = BusLog::start();
    const test::NatsServer server(
        "authorization { users: [ { user: a, password: b, permissions: { publish: [ \"good\" ], "
        "subscribe: [ \"good\" ] } } ] }");
    NatsOptions options = optionsFor(server);
    options.user = "a";
    options.password = "b";
    BusAtServer bus(options);
    Inbox<std::string> texts;
    const auto subscription = bus.collect("good", texts);
    bus.publish("bad", "x");
    EXPECT_TRUE(log.waitFor("Permissions Violation for Publish to \"bad\""));
    EXPECT_THROW(bus.collect("forbidden", texts), std::runtime_error);
    EXPECT_TRUE(log.waitFor("Permissions Violation for Subscription to \"forbidden\""));
    bus.publish("good", "y");
    EXPECT_THAT(texts.waitFor(1), ElementsAre("y"));
}

struct PendingBounds {
    std::size_t messages;
    std::size_t bytes;
};

class PendingBound : public testing::TestWithParam<PendingBounds> {};

TEST_P(PendingBound, DropsAndLogsWhatIsTooMuchForASlowHandler) {
    BusLog& log = BusLog::start();
    const test::NatsServer server;
    NatsOptions options = optionsFor(server);
    options.maxPendingMessages = GetParam().messages;
    options.maxPendingBytes = GetParam().bytes;
    BusAtServer bus(options);
    std::latch started(1);
    std::latch release(1);
    Inbox<std::string> texts;
    const auto subscription = bus.subscribe("/slow", [&](const JsonMessage& m) {
        if (m.payload() == "first") {
            started.count_down();
            release.wait();
        }
        texts.add(textOf(m));
    });
    BusAtServer publisher(server);
    publisher.publish("/slow", "first");
    started.wait();
    for (int i = 0; i < 10; ++i) {
        publisher.publish("/slow", std::string(200, static_cast<char>('a' + i)));
    }
    EXPECT_TRUE(
        log.waitFor("Slow consumer: the messages on channel \"/slow\" come faster than "
                    "they are handled, and " +
                    std::to_string(GetParam().messages) + " of them or " +
                    std::to_string(GetParam().bytes) + " bytes may wait"));
    publisher.publish("/slow", "x");
    // That has reached the slow handler's connection when one that came after it has.
    Inbox<std::string> marks;
    const auto mark = bus.collect("mark", marks);
    publisher.publish("mark", "x");
    marks.waitFor(1);
    const NatsBacklog backlog = bus.bus->backlog();
    EXPECT_EQ(backlog.messages, 5U);
    EXPECT_EQ(backlog.bytes, 1000U);
    EXPECT_EQ(backlog.dropped, 6U);
    release.count_down();
    // Five of 200 bytes had room, and nothing that came after them.
    EXPECT_THAT(texts.waitFor(6), testing::SizeIs(6));
    publisher.publish("/slow", "again");
    EXPECT_EQ(texts.waitFor(7).back(), "again");
    EXPECT_TRUE(log.waitFor("messages have been dropped so far"));
}

INSTANTIATE_TEST_SUITE_P(NatsPublish, PendingBound,
                         testing::Values(PendingBounds{8192, 1000}, PendingBounds{5, 1 << 20}));

TEST(NatsPublish, CarriesALargeDocumentByteForByte) {
    const test::NatsServer server("max_payload: 64MB\nmax_pending: 256MB");
    BusAtServer bus(server);
    BusAtServer other(server);
    std::string document(45'000'000, '\0');
    for (std::size_t i = 0; i < document.size(); ++i) {
        document[i] = static_cast<char>(i * 7 + i / 251);
    }
    Inbox<std::string> texts;
    const auto subscription = other.collect("/document", texts);
    bus.publish("/document", document);
    const auto received = texts.waitFor(1);
    ASSERT_EQ(received.size(), 1U);
    EXPECT_TRUE(received[0] == document);
}

}  // namespace
}  // namespace platform::messaging
