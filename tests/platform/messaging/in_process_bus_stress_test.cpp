// SPDX-License-Identifier: Apache-2.0
// The bus under contention; meant for the sanitizers as much as for the assertions.

#include <gtest/gtest.h>

#include <atomic>
#include <barrier>
#include <cstddef>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/messaging/in_process_bus.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

// Threads that call a function until they are told to stop.
class Repeating {
public:
    Repeating(int count, const std::function<void()>& action) {
        for (int index = 0; index < count; ++index) {
            threads_.emplace_back([this, action] {
                while (!stopped_) {
                    action();
                    std::this_thread::yield();
                }
            });
        }
    }

    ~Repeating() {
        stopped_ = true;
        for (std::thread& thread : threads_) {
            thread.join();
        }
    }

    Repeating(const Repeating&) = delete;
    Repeating& operator=(const Repeating&) = delete;

private:
    std::atomic<bool> stopped_ = false;
    std::vector<std::thread> threads_;
};

TEST(InProcessBusStress, KeepsTheOrderOfEachPublisherForEachSubscription) {
    constexpr std::size_t publishers = 6;
    constexpr std::size_t messages = 500;
    const auto bus = InProcessBus::create();
    struct Member {
        std::vector<std::size_t> next = std::vector<std::size_t>(publishers, 0);
        std::size_t misplaced = 0;
        std::shared_ptr<Subscription> subscription;
    };
    std::vector<Member> members(4);
    const auto client = clientOf(*bus);
    for (Member& member : members) {
        member.subscription = subscribe(*client, "/a", [&member](const JsonMessage& message) {
            const std::string text = textOf(message);
            const std::size_t blank = text.find(' ');
            std::size_t& next = member.next[std::stoul(text.substr(0, blank))];
            member.misplaced += std::stoul(text.substr(blank)) != next++ ? 1 : 0;
        });
    }
    std::vector<std::thread> threads;
    for (std::size_t publisher = 0; publisher < publishers; ++publisher) {
        threads.emplace_back([&, publisher] {
            const auto own = clientOf(*bus, std::to_string(publisher));
            for (std::size_t number = 0; number < messages; ++number) {
                publish(*own, "/a", std::to_string(publisher) + ' ' + std::to_string(number));
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    bus->waitUntilIdle();
    for (const Member& member : members) {
        EXPECT_EQ(member.next, std::vector<std::size_t>(publishers, messages));
        EXPECT_EQ(member.misplaced, 0u);
    }
    EXPECT_EQ(bus->queuedBytes(), 0u);
}

TEST(InProcessBusStress, NeverCallsAHandlerOrAnObserverAfterItsRelease) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/c"}, .concurrency = 3});
    const auto client = clientOf(*bus);
    const Repeating publishing(2, [&] {
        publish(*client, "/a", "text");
        publish(*client, "/c", "text");
    });
    for (int round = 0; round < 300; ++round) {
        // Freed as soon as the handles are: later calls would use freed memory.
        auto calls = std::make_unique<std::atomic<std::size_t>>(0);
        const auto count = [state = calls.get()](const JsonMessage& message) {
            *state += message.payload().size();
        };
        auto serial = subscribe(*client, "/a", count);
        auto concurrent = subscribe(*client, "/c", count);
        auto observation =
            bus->observe([count](std::string_view, const JsonMessage& message) { count(message); });
        while (*calls == 0) {
            std::this_thread::yield();
        }
        serial.reset();
        concurrent.reset();
        observation.reset();
        calls.reset();
    }
}

TEST(InProcessBusStress, MayBeReleasedInsideAndOutsideTheHandlerAtOnce) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/c"}, .concurrency = 3});
    const auto client = clientOf(*bus);
    const Repeating publishing(2, [&] {
        publish(*client, "/a", "");
        publish(*client, "/c", "");
    });
    for (int round = 0; round < 300; ++round) {
        for (const char* channel : {"/a", "/c"}) {
            struct Shared {
                std::atomic<bool> subscribed = false;
                std::atomic<bool> released = false;
                std::shared_ptr<Subscription> subscription;
            };
            auto shared = std::make_shared<Shared>();
            auto own = subscribe(*client, channel, [shared](const JsonMessage&) {
                if (shared->subscribed && !shared->released.exchange(true)) {
                    shared->subscription.reset();
                }
            });
            shared->subscription = own;
            shared->subscribed = true;
            while (!shared->released) {
                std::this_thread::yield();
            }
            own.reset();  // the last of the two ends the subscription
        }
    }
}

TEST(InProcessBusStress, AcceptsNoMoreThanItsBoundAndDeliversAllThatItAccepted) {
    constexpr std::size_t bound = 64;
    const auto bus = InProcessBus::create({.maxQueuedBytes = bound, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    std::size_t delivered = 0;
    const auto subscription = subscribe(*client, "/a", [&](const JsonMessage& message) {
        delivered += message.payload().size();
        EXPECT_LE(bus->queuedBytes(), bound);
    });
    std::atomic<std::size_t> accepted = 0;
    std::vector<std::thread> threads;
    for (int publisher = 0; publisher < 4; ++publisher) {
        threads.emplace_back([&] {
            for (std::size_t number = 0; number < 2000; ++number) {
                const std::string text(number % 40, 'x');
                try {
                    publish(*client, "/a", text);
                    accepted += text.size();
                } catch (const std::runtime_error&) {
                    std::this_thread::yield();
                }
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    bus->waitUntilIdle();
    EXPECT_EQ(delivered, accepted);
    EXPECT_GT(delivered, 0u);
    EXPECT_EQ(bus->queuedBytes(), 0u);
}

TEST(InProcessBusStress, AnswersRequestsOfManyClients) {
    constexpr int clients = 8;
    constexpr int requests = 100;
    const auto bus = InProcessBus::create({.concurrentChannels = {"/read"}, .concurrency = 4});
    const auto service = clientOf(*bus, "service");
    const auto answering = [&](const JsonMessage& message) {
        const std::string text = textOf(message);
        publish(*service, "/answer/" + text.substr(0, text.find(' ')), text);
    };
    const auto reading = subscribe(*service, "/read", answering);
    const auto writing = subscribe(*service, "/write", answering);
    std::atomic<int> answers = 0;
    std::vector<std::thread> threads;
    for (int number = 0; number < clients; ++number) {
        threads.emplace_back([&, name = std::to_string(number)] {
            const auto client = clientOf(*bus, name);
            std::atomic<int> own = 0;
            const auto subscription =
                subscribe(*client, "/answer/" + name, [&](const JsonMessage&) {
                    ++answers;
                    ++own;
                    own.notify_one();
                });
            for (int request = 0; request < requests; ++request) {
                publish(*client, request % 2 == 0 ? "/read" : "/write",
                        name + ' ' + std::to_string(request));
            }
            for (int seen = own; seen < requests; seen = own) {
                own.wait(seen);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(answers, clients * requests);
}

}  // namespace
}  // namespace platform::messaging
