// SPDX-License-Identifier: Apache-2.0
// How a worker leaves: it finishes the messages that it took and gets no new ones.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <future>
#include <iterator>
#include <latch>
#include <string>
#include <string_view>
#include <vector>

#include "platform/messaging/nats/client_backlog.h"
#include "platform/posix/file_descriptor.h"
#include "tests/platform/messaging/nats/bus_at_server.h"

namespace platform::messaging {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

NatsOptions workerOf(const test::NatsServer& server, std::size_t concurrency) {
    NatsOptions options = optionsFor(server);
    options.queueGroup = "workers";
    options.queueChannels = {"requests"};
    options.concurrentChannels = {"requests"};
    options.concurrency = concurrency;
    return options;
}

class NatsDrain : public testing::TestWithParam<std::size_t> {};

TEST_P(NatsDrain, FinishesWhatWasTakenAndLeavesTheRestToOthers) {
    const test::NatsServer server;
    BusAtServer worker(workerOf(server, GetParam()));
    BusAtServer client(server);
    std::latch started(static_cast<std::ptrdiff_t>(GetParam()));
    std::latch release(1);
    const auto requests = worker.subscribe("requests", [&](const JsonMessage& m) {
        if (m.payload() == "blocking") {
            started.count_down();
        }
        release.wait();
        worker.publish("answers", "done " + textOf(m));
    });
    Inbox<std::string> answers;
    const auto subscription = client.collect("answers", answers);
    for (std::size_t i = 0; i < GetParam(); ++i) {
        client.publish("requests", "blocking");
    }
    started.wait();
    client.publish("requests", "waiting");
    client.publish("requests", "waiting too");
    // These two have reached the worker when one that came after them has.
    Inbox<std::string> marks;
    const auto mark = worker.collect("mark", marks);
    client.publish("mark", "x");
    marks.waitFor(1);
    std::future<bool> drained =
        std::async(std::launch::async, [&] { return worker.bus->drain(std::chrono::seconds(60)); });
    // Once the first is unsubscribed, all goes to the second.
    BusAtServer second(workerOf(server, 1));
    Inbox<std::string> ofSecond;
    const auto others = second.collect("requests", ofSecond);
    EXPECT_TRUE(waitUntil([&] {
        const std::size_t before = ofSecond.items().size();
        for (int i = 0; i < 20; ++i) {
            client.publish("requests", "late");
        }
        return ofSecond.waitFor(before + 20, std::chrono::milliseconds(50)).size() >= before + 20;
    }));
    release.count_down();
    EXPECT_TRUE(drained.get());
    // Among them may be some of the late ones.
    const auto times = [&](const std::string& answer) {
        const std::vector<std::string> all = answers.items();
        return static_cast<std::size_t>(std::count(all.begin(), all.end(), answer));
    };
    EXPECT_TRUE(waitUntil([&] { return times("done blocking") == GetParam(); }));
    EXPECT_TRUE(waitUntil([&] { return times("done waiting") == 1; }));
    EXPECT_TRUE(waitUntil([&] { return times("done waiting too") == 1; }));
}

INSTANTIATE_TEST_SUITE_P(Threads, NatsDrain, testing::Values(1, 3),
                         testing::PrintToStringParamName());

TEST(NatsDrainEnd, FinishesWhatWasTakenOnASeparateChannel) {
    const test::NatsServer server;
    NatsOptions options = workerOf(server, 1);
    options.separateChannels = {"requests"};
    BusAtServer worker(options);
    BusAtServer client(server);
    std::latch started(1);
    std::latch release(1);
    const auto requests = worker.subscribe("requests", [&](const JsonMessage& m) {
        started.count_down();
        release.wait();
        worker.publish("answers", "done " + textOf(m));
    });
    Inbox<std::string> answers;
    const auto subscription = client.collect("answers", answers);
    client.publish("requests", "x");
    started.wait();
    EXPECT_TRUE(worker.bus->isConnected());
    std::future<bool> drained =
        std::async(std::launch::async, [&] { return worker.bus->drain(std::chrono::seconds(60)); });
    EXPECT_EQ(drained.wait_for(std::chrono::milliseconds(100)), std::future_status::timeout);
    release.count_down();
    EXPECT_TRUE(drained.get());
    EXPECT_THAT(answers.waitFor(1), ElementsAre("done x"));
}

TEST(NatsDrainEnd, HasTheServerHaveWhatWasPublished) {
    const test::NatsServer server("max_payload: 64MB\nmax_pending: 256MB");
    BusAtServer client(server);
    Inbox<std::size_t> sizes;
    const auto subscription =
        client.subscribe("x", [&](const JsonMessage& m) { sizes.add(m.payload().size()); });
    {
        BusAtServer worker(server);
        worker.publish("x", std::string(20'000'000, 'x'));
        worker.publish("x", "y");
        EXPECT_TRUE(worker.bus->drain(longestWait));
    }
    EXPECT_THAT(sizes.waitFor(2), ElementsAre(20'000'000U, 1U));
}

/// A client that subscribes "x" and reads only when it is told to.
class SilentClient {
public:
    explicit SilentClient(int port) : socket_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        EXPECT_EQ(::connect(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof address),
                  0);
        constexpr std::string_view hello = "CONNECT {\"verbose\":false}\r\nSUB x 1\r\nPING\r\n";
        EXPECT_EQ(::write(socket_.get(), hello.data(), hello.size()), std::ssize(hello));
        std::string answer;
        while (!answer.ends_with("PONG\r\n") && readSome(answer)) {
        }
    }

    /// Reads until `count` bytes have come.
    void read(std::size_t count) const {
        std::string all;
        while (all.size() < count && readSome(all)) {
        }
        EXPECT_GE(all.size(), count);
    }

private:
    bool readSome(std::string& text) const {
        std::array<char, 65536> chunk;
        const ssize_t count = ::read(socket_.get(), chunk.data(), chunk.size());
        text.append(chunk.data(), count > 0 ? static_cast<std::size_t>(count) : 0);
        return count > 0;
    }

    platform::FileDescriptor socket_;
};

TEST(NatsClientBacklog, IsWaitedFor) {
    const test::NatsServer server("max_payload: 64MB\nmax_pending: 256MB\nwrite_deadline: \"60s\"");
    const SilentClient client(server.port());
    BusAtServer worker(server);
    worker.publish("x", std::string(20'000'000, 'x'));
    EXPECT_TRUE(worker.bus->drain(longestWait));
    EXPECT_FALSE(waitForClientBacklog(optionsFor(server), std::chrono::milliseconds(100)));
    std::future<bool> sent = std::async(
        std::launch::async, [&] { return waitForClientBacklog(optionsFor(server), longestWait); });
    client.read(20'000'000);
    EXPECT_TRUE(sent.get());
}

TEST(NatsClientBacklog, OfAServerThatDoesNotAnswerIsWaitedForNoLongerThanAllowed) {
    const test::NatsServer server(R"(authorization {
        users: [{user: "deaf", password: "x", permissions: {publish: {deny: "$SYS.>"}}}]
    })");
    NatsOptions options = optionsFor(server);
    options.user = "deaf";
    options.password = "x";
    EXPECT_FALSE(waitForClientBacklog(options, std::chrono::milliseconds(20)));
}

TEST(NatsClientBacklog, OfAServerThatIsGoneIsAFailure) {
    test::NatsServer server;
    server.kill();
    EXPECT_THAT(failureOf([&] { waitForClientBacklog(optionsFor(server), longestWait); }),
                HasSubstr("No server available"));
}

TEST(NatsDrainEnd, AfterwardsEveryOperationFails) {
    BusLog& log = BusLog::start();
    const test::NatsServer server;
    BusAtServer bus(server);
    EXPECT_TRUE(bus.bus->drain(longestWait));
    EXPECT_FALSE(bus.bus->isConnected());
    EXPECT_THAT(failureOf([&] { bus.publish("x", "1"); }), HasSubstr("has been closed"));
    EXPECT_THAT(failureOf([&] { bus.subscribe("x", [](const JsonMessage&) {}); }),
                HasSubstr("has been closed"));
    EXPECT_THAT(failureOf([&] { bus.bus->connect("client").get(); }), HasSubstr("has been closed"));
    EXPECT_TRUE(bus.bus->drain(longestWait)) << "a second time has nothing to do";
    EXPECT_EQ(log.count("lost"), 0) << "it was not lost";
}

TEST(NatsDrainEnd, GivesUpWhenTheTimeIsOver) {
    const test::NatsServer server;
    BusAtServer bus(server);
    std::latch started(1);
    std::latch release(1);
    auto subscription = bus.subscribe("x", [&](const JsonMessage&) {
        started.count_down();
        release.wait();
    });
    bus.publish("x", "1");
    started.wait();
    EXPECT_FALSE(bus.bus->drain(std::chrono::milliseconds(20)));
    release.count_down();
}

TEST(NatsDrainEnd, DoesNotWaitForAServerThatIsGone) {
    BusLog& log = BusLog::start();
    test::NatsServer server;
    BusAtServer bus(server);
    const auto subscription = bus.subscribe("x", [](const JsonMessage&) {});
    server.kill();
    EXPECT_TRUE(log.waitFor("is lost"));
    const auto before = std::chrono::steady_clock::now();
    EXPECT_TRUE(bus.bus->drain(std::chrono::hours(1)));
    EXPECT_LT(std::chrono::steady_clock::now() - before, std::chrono::minutes(1));
}

TEST(NatsDrainEnd, EndsAConnectThatIsStillTrying) {
    BusLog& log = BusLog::start();
    NatsOptions options;
    options.servers = {"nats://127.0.0.1:" + std::to_string(test::freePort())};
    options.connectTimeout = std::chrono::hours(1);
    const auto bus = NatsBus::create(options);
    std::future<std::string> failure = std::async(
        std::launch::async, [&] { return failureOf([&] { bus->connect("client").get(); }); });
    EXPECT_TRUE(log.waitFor("Trying again"));
    EXPECT_TRUE(bus->drain(longestWait));
    EXPECT_THAT(failure.get(), HasSubstr("has been closed"));
}

}  // namespace
}  // namespace platform::messaging
