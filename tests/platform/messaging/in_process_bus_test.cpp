// SPDX-License-Identifier: Apache-2.0
// The bus as its clients see it: delivery, ends of subscriptions, bound, observers, idleness.

#include "platform/messaging/in_process_bus.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <functional>
#include <latch>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StrEq;
using testing::ThrowsMessage;

// What one subscription has received, in order.
class Inbox {
public:
    MessageHandler handler() {
        return [this](const JsonMessage& message) {
            const std::lock_guard lock(mutex_);
            texts_.push_back(textOf(message));
        };
    }

    std::vector<std::string> texts() {
        const std::lock_guard lock(mutex_);
        return texts_;
    }

private:
    std::mutex mutex_;
    std::vector<std::string> texts_;
};

// Whether a continuation runs at once.
template <typename T>
bool isResolved(futures::Future<T> future) {
    bool called = false;
    future.then([&called](futures::Future<T>) { called = true; });
    return called;
}

TEST(InProcessBus, DeliversToEverySubscriberOfTheChannelAndToNoOther) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox first;
    Inbox second;
    Inbox other;
    const auto firstSubscription = subscribe(*client, "/a", first.handler());
    const auto secondSubscription = subscribe(*clientOf(*bus), "/a", second.handler());
    const auto otherSubscription = subscribe(*client, "/a/b", other.handler());
    publish(*client, "/a", "one");
    publish(*client, "/a", "two");
    publish(*client, "/nobody", "three");
    bus->waitUntilIdle();
    EXPECT_THAT(first.texts(), ElementsAre("one", "two"));
    EXPECT_THAT(second.texts(), ElementsAre("one", "two"));
    EXPECT_THAT(other.texts(), IsEmpty());
}

TEST(InProcessBus, KeepsBusesApart) {
    const auto bus = InProcessBus::create();
    const auto otherBus = InProcessBus::create();
    Inbox inbox;
    const auto subscription = subscribe(*clientOf(*bus), "/a", inbox.handler());
    publish(*clientOf(*otherBus), "/a", "elsewhere");
    otherBus->waitUntilIdle();
    bus->waitUntilIdle();
    EXPECT_THAT(inbox.texts(), IsEmpty());
}

TEST(InProcessBus, TakesAnyBytesAsChannelAndPayload) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    const std::vector<std::string> strings = {
        "",     std::string("\0", 1),    std::string("a\0b", 3), "\xff\xfe",
        "\r\n", std::string(100000, 'x')};
    for (const std::string& channel : strings) {
        std::string seenChannel;
        std::vector<std::string> seen;
        const auto subscription = subscribe(*client, channel, [&](const JsonMessage& message) {
            seenChannel = message.channel();
            seen.push_back(textOf(message));
        });
        for (const std::string& payload : strings) {
            publish(*client, channel, payload);
        }
        bus->waitUntilIdle();
        EXPECT_EQ(seenChannel, channel);
        EXPECT_EQ(seen, strings);
    }
}

TEST(InProcessBus, ReturnsResolvedFutures) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 0, .concurrentChannels = {}});
    EXPECT_TRUE(isResolved(bus->connect("client")));
    const auto client = clientOf(*bus);
    EXPECT_TRUE(isResolved(client->subscribe("/a", [](const JsonMessage&) {})));
    EXPECT_TRUE(isResolved(client->subscribe("/a", nullptr)));
    EXPECT_TRUE(isResolved(client->publish("/a", DataBuffer())));
    const auto subscription = subscribe(*client, "/a", [](const JsonMessage&) {});
    EXPECT_TRUE(isResolved(client->publish("/a", DataBuffer::copyOf("past the bound"))));
}

TEST(InProcessBus, MovesThePayloadAndSharesItBetweenSubscribers) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::mutex mutex;
    std::vector<const char*> seen;
    const auto see = [&](const JsonMessage& message) {
        const std::lock_guard lock(mutex);
        seen.push_back(message.payload().data());
    };
    const auto first = subscribe(*client, "/a", see);
    const auto second = subscribe(*client, "/a", see);
    const auto observation =
        bus->observe([&](std::string_view, const JsonMessage& message) { see(message); });
    DataBuffer payload = DataBuffer::copyOf("moved");
    const char* const data = payload.data();
    client->publish("/a", std::move(payload)).get();
    bus->waitUntilIdle();
    EXPECT_THAT(seen, ElementsAre(data, data, data));
}

TEST(InProcessBus, KeepsTheBytesOfAMessageThatAHandlerKeeps) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::vector<JsonMessage> kept;
    {
        const auto subscription = subscribe(
            *client, "/kept", [&](const JsonMessage& message) { kept.push_back(message); });
        publish(*client, "/kept", "bytes");
        bus->waitUntilIdle();
    }
    ASSERT_EQ(kept.size(), 1u);
    EXPECT_EQ(kept.front().channel(), "/kept");
    EXPECT_EQ(kept.front().payload(), "bytes");
}

TEST(InProcessBus, DeliversOnThreadsOfItsOwn) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::thread::id handledOn;
    const auto subscription = subscribe(
        *client, "/a", [&](const JsonMessage&) { handledOn = std::this_thread::get_id(); });
    publish(*client, "/a", "");
    bus->waitUntilIdle();
    EXPECT_NE(handledOn, std::thread::id());
    EXPECT_NE(handledOn, std::this_thread::get_id());
}

TEST(InProcessBus, IsNotHeldUpByAHandlerOfAnotherSubscription) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::latch otherHandled(1);
    const auto slow = subscribe(*client, "/a", [&](const JsonMessage&) { otherHandled.wait(); });
    const auto quick =
        subscribe(*client, "/a", [&](const JsonMessage&) { otherHandled.count_down(); });
    publish(*client, "/a", "");
    bus->waitUntilIdle();
    EXPECT_TRUE(otherHandled.try_wait());
}

TEST(InProcessBus, RunsOneHandlerAtATimeByDefault) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/other"}, .concurrency = 4});
    const auto client = clientOf(*bus);
    std::atomic<int> running = 0;
    std::atomic<int> overlaps = 0;
    const auto subscription = subscribe(*client, "/serial", [&](const JsonMessage&) {
        overlaps += running.fetch_add(1);
        std::this_thread::yield();
        --running;
    });
    for (int number = 0; number < 1000; ++number) {
        publish(*client, "/serial", "");
    }
    bus->waitUntilIdle();
    EXPECT_EQ(overlaps, 0);
}

TEST(InProcessBus, RunsAsManyHandlersOfAConcurrentChannelAtOnceAsItIsTold) {
    const auto bus =
        InProcessBus::create({.concurrentChannels = {"/other", "/c"}, .concurrency = 3});
    const auto client = clientOf(*bus);
    std::latch all(3);  // nobody passes it alone
    const auto subscription =
        subscribe(*client, "/c", [&](const JsonMessage&) { all.arrive_and_wait(); });
    for (int number = 0; number < 3; ++number) {
        publish(*client, "/c", "");
    }
    bus->waitUntilIdle();
    EXPECT_TRUE(all.try_wait());
}

TEST(InProcessBus, RunsAtLeastTwoHandlersOfAConcurrentChannelAtOnce) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/c"}});
    const auto client = clientOf(*bus);
    std::latch both(2);
    const auto subscription =
        subscribe(*client, "/c", [&](const JsonMessage&) { both.arrive_and_wait(); });
    publish(*client, "/c", "");
    publish(*client, "/c", "");
    bus->waitUntilIdle();
    EXPECT_TRUE(both.try_wait());
}

TEST(InProcessBus, GoesOnAfterAHandlerFailed) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::vector<std::string> seen;
    const auto subscription = subscribe(*client, "/a", [&](const JsonMessage& message) {
        seen.push_back(textOf(message));
        if (seen.size() == 1) {
            throw std::runtime_error("expected in this test's log");
        }
        throw 2;
    });
    testing::internal::CaptureStderr();
    publish(*client, "/a", "first");
    publish(*client, "/a", "second");
    publish(*client, "/a", "third");
    bus->waitUntilIdle();
    testing::internal::GetCapturedStderr();
    EXPECT_THAT(seen, ElementsAre("first", "second", "third"));
}

TEST(InProcessBus, RefusesAnEmptyHandler) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    futures::Future<std::shared_ptr<Subscription>> future = client->subscribe("/a", nullptr);
    EXPECT_THAT([&] { future.get(); }, ThrowsMessage<std::invalid_argument>(HasSubstr("\"/a\"")));
    EXPECT_THROW(static_cast<void>(bus->observe(nullptr)), std::invalid_argument);
}

TEST(InProcessBusDeathTest, PutsAFailureToStartAThreadIntoTheFuture) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            forbidThreads();
            const auto bus = InProcessBus::create();
            const auto client = clientOf(*bus);
            auto future = client->subscribe("/a", [](const JsonMessage&) {});
            try {
                future.get();
            } catch (const std::system_error&) {
                publish(*client, "/a", "still accepted");
                bus->waitUntilIdle();
                std::_Exit(0);
            }
            std::_Exit(1);
        },
        testing::ExitedWithCode(0), "");
}

// Ends of subscriptions.

TEST(Subscription, EndsWhenItIsReleased) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox inbox;
    Inbox other;
    auto subscription = subscribe(*client, "/a", inbox.handler());
    const auto otherSubscription = subscribe(*client, "/a", other.handler());
    publish(*client, "/a", "before");
    bus->waitUntilIdle();
    subscription.reset();
    publish(*client, "/a", "after");
    bus->waitUntilIdle();
    EXPECT_THAT(inbox.texts(), ElementsAre("before"));
    EXPECT_THAT(other.texts(), ElementsAre("before", "after"));
}

TEST(Subscription, HasDestroyedTheHandlerWhenItsReleaseReturns) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/c"}, .concurrency = 3});
    const auto client = clientOf(*bus);
    for (const char* channel : {"/a", "/c"}) {
        auto held = std::make_shared<int>(1);
        const std::weak_ptr<int> alive = held;
        auto subscription = subscribe(*client, channel, [held](const JsonMessage&) {});
        held.reset();
        publish(*client, channel, "");
        EXPECT_FALSE(alive.expired());
        subscription.reset();
        EXPECT_TRUE(alive.expired());
    }
}

TEST(Subscription, WaitsForARunningHandlerWhenItIsReleased) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    for (int round = 0; round < 100; ++round) {
        std::latch entered(1);
        int done = 0;  // not atomic: the release has to order the accesses
        auto subscription = subscribe(*client, "/a", [&](const JsonMessage&) {
            entered.count_down();
            std::this_thread::yield();
            done = 1;
        });
        publish(*client, "/a", "");
        entered.wait();
        subscription.reset();
        EXPECT_EQ(done, 1);
    }
}

TEST(Subscription, DropsItsQueuedMessagesWhenItIsReleased) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::latch entered(1);
    std::latch dropped(1);
    int calls = 0;
    auto subscription = subscribe(*client, "/a", [&](const JsonMessage&) {
        ++calls;
        entered.count_down();
        dropped.wait();
    });
    publish(*client, "/a", "running");
    entered.wait();
    publish(*client, "/a", "12345");
    publish(*client, "/a", "678");
    EXPECT_EQ(bus->queuedBytes(), 8u);
    std::thread watcher([&] {
        while (bus->queuedBytes() != 0) {
            std::this_thread::yield();
        }
        dropped.count_down();
    });
    subscription.reset();
    watcher.join();
    EXPECT_EQ(calls, 1);
    bus->waitUntilIdle();
}

TEST(Subscription, MayBeReleasedByItsHandler) {
    const auto bus = InProcessBus::create({.concurrentChannels = {"/c"}, .concurrency = 3});
    const auto client = clientOf(*bus);
    for (const char* channel : {"/a", "/c"}) {
        std::shared_ptr<Subscription> subscription;
        std::latch subscribed(1);
        auto held = std::make_shared<int>(3);
        const std::weak_ptr<int> alive = held;
        std::atomic<int> calls = 0;
        int seen = 0;
        subscription = subscribe(*client, channel, [&, held](const JsonMessage&) {
            subscribed.wait();
            if (calls++ == 0) {
                subscription.reset();
                seen = *held;
            }
        });
        held.reset();
        publish(*client, channel, "releases");
        subscribed.count_down();
        bus->waitUntilIdle();
        EXPECT_TRUE(alive.expired()) << "an idle bus runs nothing of a released subscription";
        publish(*client, channel, "too late");
        bus->waitUntilIdle();
        EXPECT_EQ(calls, 1);
        EXPECT_EQ(seen, 3);
    }
}

TEST(Subscription, MayBeReleasedByAHandlerThatOwnsAllThatIsLeft) {
    struct Owner {
        std::shared_ptr<InProcessBus> bus;
        std::shared_ptr<MessageService> client;
        std::shared_ptr<Subscription> subscription;
        std::latch* subscribed;
        std::latch* destroyed;
        ~Owner() {
            subscription.reset();
            client.reset();
            bus.reset();
            destroyed->count_down();
        }
    };
    std::latch subscribed(1);
    std::latch destroyed(1);
    auto owner = std::make_shared<Owner>();
    owner->bus = InProcessBus::create();
    owner->client = clientOf(*owner->bus);
    owner->subscribed = &subscribed;
    owner->destroyed = &destroyed;
    const std::shared_ptr<MessageService>& client = owner->client;
    owner->subscription = subscribe(*client, "/a", [owner](const JsonMessage&) {
        owner->subscribed->wait();
        owner->subscription.reset();  // ends the cycle of ownership; the rest ends with the handler
    });
    publish(*client, "/a", "");
    owner.reset();
    subscribed.count_down();
    destroyed.wait();
}

TEST(Subscription, MayBeReleasedByTheHandlerOfAnother) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox inbox;
    auto released = subscribe(*client, "/a", inbox.handler());
    const auto releasing =
        subscribe(*client, "/end", [&](const JsonMessage&) { released.reset(); });
    publish(*client, "/a", "before");
    bus->waitUntilIdle();
    publish(*client, "/end", "");
    bus->waitUntilIdle();
    publish(*client, "/a", "after");
    bus->waitUntilIdle();
    EXPECT_THAT(inbox.texts(), ElementsAre("before"));
}

TEST(Subscription, OutlivesItsClientAndItsBus) {
    auto bus = InProcessBus::create();
    auto publisher = clientOf(*bus);
    auto subscriber = clientOf(*bus);
    std::latch received(1);
    auto subscription =
        subscribe(*subscriber, "/a", [&](const JsonMessage&) { received.count_down(); });
    subscriber.reset();
    bus.reset();
    publish(*publisher, "/a", "");
    received.wait();
    publisher.reset();
    subscription.reset();
}

TEST(Subscription, MayBeMadeByAHandler) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox inbox;
    std::shared_ptr<Subscription> inner;
    const auto outer = subscribe(*client, "/start", [&](const JsonMessage&) {
        inner = subscribe(*client, "/a", inbox.handler());
        publish(*client, "/a", "from the handler");
    });
    publish(*client, "/start", "");
    bus->waitUntilIdle();
    EXPECT_THAT(inbox.texts(), ElementsAre("from the handler"));
}

TEST(Subscription, LeavesNothingOfALibraryBehindThatIsUnloaded) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox answers;
    const auto subscription = subscribe(*client, "/module/answer", answers.handler());
    testing::internal::CaptureStderr();
    for (int round = 0; round < 20; ++round) {
        void* const library = dlopen(MESSAGING_TEST_MODULE, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(library, nullptr) << dlerror();
        const auto start = reinterpret_cast<void (*)(const std::shared_ptr<MessageService>&)>(
            dlsym(library, "startModule"));
        const auto stop = reinterpret_cast<void (*)()>(dlsym(library, "stopModule"));
        ASSERT_NE(start, nullptr);
        ASSERT_NE(stop, nullptr);
        start(client);
        publish(*client, "/module/request", "a request");
        if (round % 2 == 0) {
            bus->waitUntilIdle();
        }
        publish(*client, "/module/request", "another");
        stop();
        ASSERT_EQ(dlclose(library), 0);
        ASSERT_EQ(dlopen(MESSAGING_TEST_MODULE, RTLD_NOW | RTLD_NOLOAD), nullptr);
        publish(*client, "/module/request", "to nobody");
        bus->waitUntilIdle();
    }
    EXPECT_THAT(testing::internal::GetCapturedStderr(), HasSubstr("/module/request"));
    EXPECT_THAT(answers.texts(), testing::Contains("answer to a request").Times(testing::Ge(10)));
    EXPECT_THAT(answers.texts(), testing::Not(testing::Contains("answer to to nobody")));
}

// The bound.

TEST(Bound, RefusesWhatWouldTakeTheWaitingBytesPastIt) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 10, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    std::latch entered(1);
    std::latch proceed(1);
    std::vector<std::string> seen;
    const auto subscription = subscribe(*client, "/bounded", [&](const JsonMessage& message) {
        seen.push_back(textOf(message));
        entered.count_down();
        proceed.wait();
    });
    publish(*client, "/bounded", "running");  // waits no longer
    entered.wait();
    EXPECT_EQ(bus->queuedBytes(), 0u);
    publish(*client, "/bounded", "123456");
    publish(*client, "/bounded", "7890");
    EXPECT_EQ(bus->queuedBytes(), 10u);
    futures::Future<void> refused = client->publish("/bounded", DataBuffer::copyOf("more"));
    EXPECT_THAT([&] { refused.get(); },
                ThrowsMessage<std::runtime_error>(
                    StrEq("Message of 4 bytes on channel \"/bounded\" was not accepted: 10 bytes "
                          "are waiting to be delivered, and 10 may wait at most.")));
    publish(*client, "/bounded", "");
    proceed.count_down();
    bus->waitUntilIdle();
    EXPECT_EQ(bus->queuedBytes(), 0u);
    publish(*client, "/bounded", "0123456789");
    bus->waitUntilIdle();
    EXPECT_THAT(seen, ElementsAre("running", "123456", "7890", "", "0123456789"));
}

TEST(Bound, RefusesASingleMessageThatIsLarger) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 10, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    Inbox inbox;
    const auto subscription = subscribe(*client, "/a", inbox.handler());
    EXPECT_THAT([&] { publish(*client, "/a", "12345678901"); },
                ThrowsMessage<std::runtime_error>(HasSubstr("11 bytes")));
    bus->waitUntilIdle();
    EXPECT_THAT(inbox.texts(), IsEmpty());
}

TEST(Bound, CountsAMessageOfSeveralQueuesOnceUntilItHasLeftThemAll) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 10, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    std::latch bothEntered(2);
    std::latch proceedFirst(1);
    std::latch proceedSecond(1);
    std::latch firstTookSecondMessage(1);
    int firstCalls = 0;
    const auto first = subscribe(*client, "/a", [&](const JsonMessage&) {
        if (++firstCalls == 1) {
            bothEntered.count_down();
            proceedFirst.wait();
        } else {
            firstTookSecondMessage.count_down();
        }
    });
    int secondCalls = 0;
    const auto second = subscribe(*client, "/a", [&](const JsonMessage&) {
        if (++secondCalls == 1) {
            bothEntered.count_down();
            proceedSecond.wait();
        }
    });
    publish(*client, "/a", "");
    bothEntered.wait();
    publish(*client, "/a", "0123456789");
    EXPECT_EQ(bus->queuedBytes(), 10u);
    proceedFirst.count_down();
    firstTookSecondMessage.wait();
    EXPECT_EQ(bus->queuedBytes(), 10u);
    proceedSecond.count_down();
    bus->waitUntilIdle();
    EXPECT_EQ(bus->queuedBytes(), 0u);
    EXPECT_EQ(secondCalls, 2);
}

TEST(Bound, DoesNotHoldForMessagesThatNobodyWaitsFor) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 0, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    std::string observed;
    const auto observation = bus->observe(
        [&](std::string_view, const JsonMessage& message) { observed = message.payload(); });
    publish(*client, "/nobody", "an answer");
    EXPECT_EQ(observed, "an answer");
}

TEST(Bound, FailsAHandlersPublishInsteadOfBlockingIt) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 4, .concurrentChannels = {}});
    const auto client = clientOf(*bus);
    std::latch entered(1);
    std::latch full(1);
    std::vector<std::string> answers;
    const auto subscription = subscribe(*client, "/a", [&](const JsonMessage& message) {
        if (message.payload() == "1") {
            entered.count_down();
            full.wait();
            try {
                publish(*client, "/a", "from the handler");
                answers.emplace_back("accepted");
            } catch (const std::runtime_error&) {
                answers.emplace_back("refused");
            }
        }
    });
    publish(*client, "/a", "1");
    entered.wait();
    publish(*client, "/a", "fo");
    publish(*client, "/a", "ur");
    full.count_down();
    bus->waitUntilIdle();
    EXPECT_THAT(answers, ElementsAre("refused"));
}

// Observers.

TEST(Observer, SeesEachAcceptedMessageWithItsSenderOnThePublishingThread) {
    const auto bus = InProcessBus::create({.maxQueuedBytes = 3, .concurrentChannels = {}});
    std::vector<std::string> seen;  // without a lock: all of it happens on this thread
    const auto observation =
        bus->observe([&](std::string_view clientName, const JsonMessage& message) {
            seen.push_back(std::string(clientName) + " on " + std::string(message.channel()) +
                           ": " + textOf(message));
        });
    const auto subscription = subscribe(*clientOf(*bus), "/a", [](const JsonMessage&) {});
    publish(*clientOf(*bus, "Ann"), "/a", "one");
    bus->waitUntilIdle();
    publish(*clientOf(*bus, ""), "/b", "two");
    EXPECT_THROW(publish(*clientOf(*bus, "Bob"), "/a", "not accepted"), std::runtime_error);
    EXPECT_THAT(seen, ElementsAre("Ann on /a: one", " on /b: two"));
}

TEST(Observer, SeesAMessageBeforeItsHandlerAnswersIt) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    const auto subscription = subscribe(*client, "/request", [&](const JsonMessage& message) {
        publish(*client, "/answer", message.payload());
    });
    std::mutex mutex;
    std::map<std::string, std::vector<std::string>> seen;
    const auto observation = bus->observe([&](std::string_view, const JsonMessage& message) {
        const std::lock_guard lock(mutex);
        seen[textOf(message)].emplace_back(message.channel());
    });
    for (int number = 0; number < 200; ++number) {
        publish(*client, "/request", std::to_string(number));
    }
    bus->waitUntilIdle();
    EXPECT_EQ(seen.size(), 200u);
    for (const auto& [text, channels] : seen) {
        EXPECT_THAT(channels, ElementsAre("/request", "/answer")) << text;
    }
}

TEST(Observer, HoldsUpThePublisherAndTheIdleness) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::latch entered(1);
    std::latch proceed(1);
    bool observed = false;  // not atomic: waiting for idleness has to order the accesses
    const auto observation = bus->observe([&](std::string_view, const JsonMessage&) {
        entered.count_down();
        proceed.wait();
        observed = true;
    });
    bool published = false;
    std::thread publisher([&] {
        publish(*client, "/a", "");
        published = observed;
    });
    entered.wait();
    std::thread opener([&] { proceed.count_down(); });
    bus->waitUntilIdle();
    EXPECT_TRUE(observed);
    publisher.join();
    EXPECT_TRUE(published);
    opener.join();
}

TEST(Observer, DoesNotKeepAMessageFromBeingDeliveredWhenItFails) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    Inbox inbox;
    const auto subscription = subscribe(*client, "/a", inbox.handler());
    const auto failing = bus->observe([](std::string_view, const JsonMessage&) { throw 1; });
    int others = 0;
    const auto other = bus->observe([&](std::string_view, const JsonMessage&) { ++others; });
    testing::internal::CaptureStderr();
    publish(*client, "/a", "delivered");
    bus->waitUntilIdle();
    testing::internal::GetCapturedStderr();
    EXPECT_THAT(inbox.texts(), ElementsAre("delivered"));
    EXPECT_EQ(others, 1);
}

TEST(Observer, EndsWhenItsHandleIsReleased) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    int calls = 0;
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    auto observation = bus->observe(
        [&calls, held = std::move(held)](std::string_view, const JsonMessage&) { ++calls; });
    publish(*client, "/a", "");
    observation.reset();
    EXPECT_TRUE(alive.expired());
    publish(*client, "/a", "");
    EXPECT_EQ(calls, 1);
}

TEST(Observer, MayReleaseItselfAndPublish) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    std::vector<std::string> seen;
    std::shared_ptr<Subscription> observation;
    observation = bus->observe([&](std::string_view, const JsonMessage& message) {
        seen.push_back(textOf(message));
        if (seen.size() == 3) {
            observation.reset();
        }
        publish(*client, "/a", textOf(message) + "+");
    });
    publish(*client, "/a", "a");
    publish(*client, "/a", "unseen");
    EXPECT_THAT(seen, ElementsAre("a", "a+", "a++"));
}

// Idleness.

TEST(WaitUntilIdle, ReturnsAtOnceWhenNothingWasPublished) {
    InProcessBus::create()->waitUntilIdle();
}

TEST(WaitUntilIdle, WaitsForWhatHandlersPublish) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    for (int round = 0; round < 50; ++round) {
        int left = 20;  // not atomic: waiting for idleness has to order the accesses
        std::vector<std::shared_ptr<Subscription>> subscriptions;
        for (const auto& [from, to] : {std::pair("/ping", "/pong"), std::pair("/pong", "/ping")}) {
            subscriptions.push_back(subscribe(*client, from, [&, to = to](const JsonMessage&) {
                if (--left > 0) {
                    publish(*client, to, "");
                }
            }));
        }
        publish(*client, "/ping", "");
        bus->waitUntilIdle();
        EXPECT_EQ(left, 0);
    }
}

TEST(WaitUntilIdle, WaitsForFailingHandlersAndNotForReleasedSubscriptions) {
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    testing::internal::CaptureStderr();
    int calls = 0;
    const auto failing = subscribe(*client, "/a", [&](const JsonMessage&) {
        ++calls;
        throw 1;
    });
    auto released = subscribe(*client, "/a", [](const JsonMessage&) {});
    for (int number = 0; number < 100; ++number) {
        publish(*client, "/a", "");
    }
    released.reset();
    bus->waitUntilIdle();
    EXPECT_EQ(calls, 100);
    testing::internal::GetCapturedStderr();
}

// Any sequence of operations on one thread delivers what a list of lists would.
TEST(InProcessBus, DeliversWhatItIsToldToInAnyOrderOfOperations) {
    const std::vector<std::string> channels = {"", "/", "/a", "/a/", std::string("/a\0", 3)};
    std::mt19937 random(31);
    const auto below = [&](std::size_t bound) {
        return static_cast<std::size_t>(random() % bound);
    };
    for (int round = 0; round < 30; ++round) {
        const auto bus = InProcessBus::create({.concurrentChannels = {}});
        const auto client = clientOf(*bus);
        struct Member {
            std::string channel;
            std::unique_ptr<Inbox> inbox;
            std::vector<std::string> expected;
            std::shared_ptr<Subscription> subscription;
        };
        std::vector<Member> members;
        for (int step = 0; step < 60; ++step) {
            const std::string& channel = channels[below(channels.size())];
            switch (below(4)) {
                case 0:
                    members.push_back({channel, std::make_unique<Inbox>(), {}, nullptr});
                    members.back().subscription =
                        subscribe(*client, channel, members.back().inbox->handler());
                    break;
                case 1:
                    if (!members.empty()) {
                        bus->waitUntilIdle();
                        members[below(members.size())].subscription.reset();
                    }
                    break;
                default:
                    publish(*client, channel, std::to_string(step));
                    for (Member& member : members) {
                        if (member.subscription && member.channel == channel) {
                            member.expected.push_back(std::to_string(step));
                        }
                    }
            }
        }
        bus->waitUntilIdle();
        for (const Member& member : members) {
            ASSERT_EQ(member.inbox->texts(), member.expected);
        }
    }
}

}  // namespace
}  // namespace platform::messaging
