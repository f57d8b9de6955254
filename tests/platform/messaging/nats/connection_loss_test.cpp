// SPDX-License-Identifier: Apache-2.0
// Servers that go away, come back, turn the bus away, and are not there yet.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <future>
#include <string>
#include <thread>

#include "tests/platform/messaging/nats/bus_at_server.h"

namespace platform::messaging {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;

// Publishes until something arrives: what is under way when a connection breaks is lost.
bool arrives(BusAtServer& from, const std::string& channel, Inbox<std::string>& texts,
             const std::string& text) {
    return waitUntil([&] {
        failureOf([&] { from.publish(channel, text); });
        const auto items = texts.waitFor(1, std::chrono::milliseconds(20));
        return std::find(items.begin(), items.end(), text) != items.end();
    });
}

TEST(NatsConnectionLoss, ReconnectsAndResubscribesWhenAServerIsKilledAndComesBack) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    BusAtServer bus(server);
    Inbox<std::string> texts;
    const auto one = bus.collect("x", texts);
    std::uint64_t reconnects = 0;
    for (const std::string text : {"first", "second", "third"}) {
        server.kill();
        EXPECT_TRUE(log.waitFor("The connection to NATS is lost"));
        EXPECT_FALSE(bus.bus->isConnected());
        server.start();
        EXPECT_TRUE(log.waitFor("Connected to NATS again, at " + server.url()));
        BusAtServer publisher(server);
        EXPECT_TRUE(arrives(publisher, "x", texts, text));
        EXPECT_TRUE(arrives(bus, "x", texts, "own " + text));
        EXPECT_EQ(bus.bus->reconnects(), ++reconnects);
        BusLog::start();
    }
}

TEST(NatsConnectionLoss, ReleasedSubscriptionsStayReleased) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    BusAtServer bus(server);
    Inbox<std::string> released;
    Inbox<std::string> kept;
    auto first = bus.collect("x", released);
    const auto second = bus.collect("x", kept);
    server.kill();
    EXPECT_TRUE(log.waitFor("is lost"));
    first.reset();
    server.start();
    EXPECT_TRUE(arrives(bus, "x", kept, "1"));
    EXPECT_THAT(released.items(), testing::IsEmpty());
}

TEST(NatsConnectionLoss, SubscriptionsMadeWithoutAServerComeToLifeWithIt) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    BusAtServer bus(server);
    server.kill();
    EXPECT_TRUE(log.waitFor("is lost"));
    Inbox<std::string> texts;
    const auto subscription = bus.collect("x", texts);
    server.start();
    EXPECT_TRUE(arrives(bus, "x", texts, "1"));
}

TEST(NatsConnectionLoss, SendsLaterWhatWasPublishedWithoutAServerUpToABound) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    NatsOptions options = optionsFor(server);
    options.maxUnsentBytes = 1000;
    BusAtServer bus(options);
    BusAtServer other(server);
    Inbox<std::string> texts;
    const auto subscription = other.collect("x", texts);
    server.kill();
    EXPECT_TRUE(waitUntil([&] { return log.count("is lost") == 2; }));
    const std::string large(900, 'l');
    bus.publish("x", "1");
    bus.publish("x", large);
    bus.publish("x", large);  // takes it past the bound
    EXPECT_THAT(failureOf([&] { bus.publish("x", "2"); }),
                AllOf(HasSubstr("A message of 1 bytes on channel \"x\" was not published"),
                      HasSubstr("No server is connected")));
    EXPECT_EQ(log.count("was not published"), 1);
    server.start();
    EXPECT_TRUE(waitUntil([&] { return bus.bus->isConnected() && other.bus->isConnected(); }));
    EXPECT_TRUE(arrives(bus, "x", texts, "3"));
    // The other client may be back later than the messages.
    EXPECT_THAT(texts.items(), testing::Not(Contains("2")));
}

// libnats gives a connection up when a server refuses it twice.
TEST(NatsConnectionLoss, OutlastsAServerThatTurnsItAway) {
    BusLog& log = BusLog::start();
    test::NatsServer server("authorization { token: good }");
    NatsOptions options = optionsFor(server);
    options.token = "good";
    BusAtServer bus(options);
    Inbox<std::string> texts;
    const auto subscription = bus.collect("x", texts);
    server.kill();
    server.startWith("authorization { token: other }");
    EXPECT_TRUE(log.waitFor("NATS has ended the connection"));
    EXPECT_TRUE(log.waitFor("Trying again"));
    EXPECT_FALSE(bus.bus->isConnected());
    server.kill();
    server.startWith("authorization { token: good }");
    EXPECT_TRUE(log.waitFor("Connected to NATS again"));
    EXPECT_EQ(bus.bus->reconnects(), 1U);
    EXPECT_TRUE(arrives(bus, "x", texts, "1"));
    EXPECT_EQ(log.count("good"), 0) << "secrets do not belong in logs";
}

// A protocol error, too, makes libnats give the connection up.
TEST(NatsConnectionLoss, OutlastsAServerThatTakesLessThanTheOneBefore) {
    BusLog& log = BusLog::start();
    test::NatsServer server("max_payload: 1000");
    BusAtServer bus(server);
    Inbox<std::string> texts;
    const auto subscription = bus.collect("x", texts);
    server.kill();
    EXPECT_TRUE(log.waitFor("is lost"));
    bus.publish("x", std::string(900, 'x'));  // waits for a server
    server.startWith("max_payload: 100");
    EXPECT_TRUE(log.waitFor("Maximum Payload"));
    EXPECT_TRUE(log.waitFor("Connected to NATS again"));
    EXPECT_TRUE(arrives(bus, "x", texts, "1"));
    EXPECT_THAT(failureOf([&] { bus.publish("x", std::string(101, 'x')); }),
                HasSubstr("up to 100 bytes"));
}

TEST(NatsConnectionLoss, GoesToAnotherServerOfTheCluster) {
    const int routes = test::freePort();
    const std::string cluster = "cluster { name: c, listen: \"127.0.0.1:";
    test::NatsServer first(cluster + std::to_string(routes) + "\" }");
    const test::NatsServer second(cluster + std::to_string(test::freePort()) +
                                  "\", routes: [ \"nats://127.0.0.1:" + std::to_string(routes) +
                                  "\" ] }");
    BusAtServer bus(first);  // which knows of no other
    BusAtServer other(second);
    Inbox<std::string> texts;
    const auto subscription = bus.collect("x", texts);
    EXPECT_TRUE(arrives(other, "x", texts, "through the cluster"));
    first.kill();
    EXPECT_TRUE(arrives(other, "x", texts, "from the second"));
}

TEST(NatsConnectionLoss, WaitsForAServerThatIsNotThereYet) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    server.kill();
    NatsOptions options = optionsFor(server);
    options.connectTimeout = longestWait;
    const auto bus = NatsBus::create(options);
    std::future<std::shared_ptr<MessageService>> client =
        std::async(std::launch::async, [&] { return bus->connect("client").get(); });
    EXPECT_TRUE(log.waitFor("Trying again"));
    server.start();
    EXPECT_NE(client.get(), nullptr);
    EXPECT_TRUE(bus->isConnected());
}

TEST(NatsConnectionLoss, GivesUpOnAServerThatDoesNotCome) {
    NatsOptions options;
    options.servers = {"nats://127.0.0.1:" + std::to_string(test::freePort())};
    options.connectTimeout = std::chrono::milliseconds(600);
    const auto bus = NatsBus::create(options);
    EXPECT_THAT(failureOf([&] { bus->connect("client").get(); }), HasSubstr("Cannot connect"));
}

TEST(NatsConnectionLoss, DoesNotWaitForAServerThatRefuses) {
    const test::NatsServer server("authorization { token: good }");
    NatsOptions options = optionsFor(server);
    options.token = "bad";
    options.connectTimeout = std::chrono::hours(1);
    const auto bus = NatsBus::create(options);
    EXPECT_THAT(failureOf([&] { bus->connect("client").get(); }), HasSubstr("Authorization"));
}

TEST(NatsConnectionLoss, ConnectsAfterAnAttemptThatFailed) {
    test::NatsServer server;
    server.kill();
    const auto bus = NatsBus::create(optionsFor(server));
    EXPECT_NE(failureOf([&] { bus->connect("client").get(); }), "");
    server.start();
    EXPECT_NE(bus->connect("client").get(), nullptr);
}

}  // namespace
}  // namespace platform::messaging
