// SPDX-License-Identifier: Apache-2.0
// Nothing is left of subscriptions and buses that are gone.

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/platform/messaging/nats/bus_at_server.h"
#include "tests/support/process_state.h"

namespace platform::messaging {
namespace {

TEST(NatsRelease, AThousandSubscriptionsLeaveNoThread) {
    const test::NatsServer server;
    BusAtServer bus(server);
    const std::size_t before = test::listedThreads();
    for (int round = 0; round < 10; ++round) {
        std::vector<std::shared_ptr<Subscription>> subscriptions;
        for (int i = 0; i < 100; ++i) {
            subscriptions.push_back(bus.subscribe("x", [](const JsonMessage&) {}));
        }
        EXPECT_EQ(test::listedThreads(), before + 100) << "one for each";
        bus.publish("x", "1");
    }
    EXPECT_TRUE(test::comesToThreads(before));
}

TEST(NatsRelease, AThousandBusesLeaveNoThreadAndNoSocket) {
    const test::NatsServer server;
    const auto use = [&] {
        BusAtServer bus(server);
        Inbox<std::string> texts;
        const auto subscription = bus.collect("x", texts);
        bus.publish("x", "1");
        texts.waitFor(1);
    };
    use();  // has libnats start the threads that it keeps
    const std::size_t threadsBefore = test::listedThreads();
    const std::size_t descriptorsBefore = test::openDescriptors();
    for (int i = 0; i < 1000; ++i) {
        use();
    }
    EXPECT_TRUE(test::comesToThreads(threadsBefore));
    EXPECT_TRUE(waitUntil([&] { return test::openDescriptors() == descriptorsBefore; }));
}

TEST(NatsRelease, SubscriptionsComeAndGoWhileMessagesArriveAndTheServerDoesNot) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    BusAtServer bus(server);
    std::atomic<bool> stop = false;
    std::vector<std::thread> users;
    for (int t = 0; t < 3; ++t) {
        users.emplace_back([&] {
            while (!stop) {
                std::atomic<bool> gone = false;
                auto subscription =
                    bus.subscribe("x", [&](const JsonMessage&) { EXPECT_FALSE(gone); });
                failureOf([&] { bus.publish("x", "1"); });
                subscription.reset();
                gone = true;
            }
        });
    }
    server.kill();
    EXPECT_TRUE(log.waitFor("is lost"));
    server.start();
    EXPECT_TRUE(log.waitFor("Connected to NATS again"));
    stop = true;
    for (std::thread& user : users) {
        user.join();
    }
}

}  // namespace
}  // namespace platform::messaging
