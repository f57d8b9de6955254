// SPDX-License-Identifier: Apache-2.0
// Queues on their own: order, threads, what messages hold, and ends from every side.

#include "platform/messaging/delivery_queue.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <functional>
#include <latch>
#include <memory>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "platform/data_buffer.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

using Hold = std::shared_ptr<const void>;

JsonMessage message(const std::string& text) {
    return {std::make_shared<const std::string>("channel"),
            std::make_shared<const DataBuffer>(DataBuffer::copyOf(text))};
}

Hold holdThatCalls(std::function<void()> onRelease) {
    return {nullptr, [onRelease = std::move(onRelease)](const void*) { onRelease(); }};
}

TEST(DeliveryQueue, DeliversInTheOrderPushed) {
    std::vector<std::string> seen;
    std::latch done(100);
    DeliveryQueue queue(
        [&](const JsonMessage& delivered) {
            seen.emplace_back(delivered.payload());
            done.count_down();
        },
        1);
    std::vector<std::string> pushed;
    for (int number = 0; number < 100; ++number) {
        pushed.push_back(std::to_string(number));
        queue.push({message(pushed.back()), nullptr, nullptr});
    }
    done.wait();
    EXPECT_EQ(seen, pushed);
}

TEST(DeliveryQueue, RunsAsManyHandlersAtOnceAsItHasThreads) {
    std::latch all(3);
    std::latch done(3);
    DeliveryQueue queue(
        [&](const JsonMessage&) {
            all.arrive_and_wait();
            done.count_down();
        },
        3);
    for (int number = 0; number < 3; ++number) {
        queue.push({message(""), nullptr, nullptr});
    }
    done.wait();
}

TEST(DeliveryQueue, ReleasesWhatAMessageHoldsAlongTheWay) {
    std::latch leftQueue(1);
    std::latch done(1);
    DeliveryQueue queue(
        [&](const JsonMessage&) {
            leftQueue.wait();
            EXPECT_FALSE(done.try_wait());
        },
        1);
    queue.push({message(""), holdThatCalls([&] { leftQueue.count_down(); }),
                holdThatCalls([&] { done.count_down(); })});
    done.wait();
}

TEST(DeliveryQueue, ReleasesTheHoldsOfDroppedMessagesBeforeItWaitsForTheHandler) {
    std::latch entered(1);
    std::latch released(2);
    int calls = 0;
    DeliveryQueue queue(
        [&](const JsonMessage&) {
            ++calls;
            entered.count_down();
            released.wait();
        },
        1);
    queue.push({message("runs"), nullptr, nullptr});
    entered.wait();
    queue.push({message("dropped"), holdThatCalls([&] { released.count_down(); }),
                holdThatCalls([&] { released.count_down(); })});
    queue.close();
    EXPECT_EQ(calls, 1);
}

TEST(DeliveryQueue, DropsWhatIsPushedAfterItWasClosed) {
    int calls = 0;
    bool released = false;
    DeliveryQueue queue([&](const JsonMessage&) { ++calls; }, 1);
    queue.close();
    queue.push({message(""), nullptr, holdThatCalls([&] { released = true; })});
    EXPECT_TRUE(released);
    queue.close();
    EXPECT_EQ(calls, 0);
}

TEST(DeliveryQueue, HasDestroyedTheHandlerWhenCloseReturns) {
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    DeliveryQueue queue([held = std::move(held)](const JsonMessage&) {}, 2);
    EXPECT_FALSE(alive.expired());
    queue.close();
    EXPECT_TRUE(alive.expired());
}

TEST(DeliveryQueue, MayBeDestroyedByItsHandler) {
    for (const std::size_t threads : {1u, 4u}) {
        auto held = std::make_shared<int>(5);
        const std::weak_ptr<int> alive = held;
        std::latch done(1);
        int seen = 0;
        int calls = 0;
        bool handlerAliveAtTheEnd = true;
        std::unique_ptr<DeliveryQueue> queue;
        std::latch created(1);
        queue = std::make_unique<DeliveryQueue>(
            [&, held = std::move(held)](const JsonMessage&) {
                created.wait();
                ++calls;
                queue.reset();
                seen = *held;
            },
            threads);
        queue->push({message(""), nullptr, holdThatCalls([&] {
                         handlerAliveAtTheEnd = !alive.expired();
                         done.count_down();
                     })});
        created.count_down();
        done.wait();
        EXPECT_EQ(calls, 1);
        EXPECT_EQ(seen, 5) << "the handler lives as long as its call";
        EXPECT_FALSE(handlerAliveAtTheEnd);
    }
}

TEST(DeliveryQueueDeathTest, ThrowsWhenAThreadCannotBeStarted) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            forbidThreads();
            auto held = std::make_shared<int>(1);
            const std::weak_ptr<int> alive = held;
            try {
                DeliveryQueue queue([held = std::move(held)](const JsonMessage&) {}, 2);
            } catch (const std::system_error& refused) {
                std::_Exit(alive.expired() &&
                                   refused.code() == std::errc::resource_unavailable_try_again
                               ? 0
                               : 1);
            }
            std::_Exit(2);
        },
        testing::ExitedWithCode(0), "");
}

}  // namespace
}  // namespace platform::messaging
