// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/memory_budget.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <mutex>
#include <optional>
#include <random>
#include <stdexcept>
#include <thread>
#include <utility>
#include <vector>

namespace platform::messaging {
namespace {

using Reservation = MemoryBudget::Reservation;

TEST(MemoryBudget, GivesWhatIsFreeAndNoMore) {
    MemoryBudget budget(100);
    const auto first = budget.tryReserve(60);
    ASSERT_TRUE(first);
    EXPECT_EQ(first->bytes(), 60u);
    EXPECT_FALSE(budget.tryReserve(41));
    EXPECT_TRUE(budget.tryReserve(40));
    EXPECT_EQ(budget.reserved(), 60u);
    EXPECT_EQ(budget.size(), 100u);
}

TEST(MemoryBudget, TakesBackWhatAReservationHeldAtItsEnd) {
    MemoryBudget budget(100);
    std::optional<Reservation> held = budget.tryReserve(100);
    ASSERT_TRUE(held);
    Reservation moved = std::move(*held);
    held.reset();
    EXPECT_EQ(budget.reserved(), 100u);
    moved.shrink(30);
    EXPECT_EQ(budget.reserved(), 30u);
    moved.shrink(50);  // does not grow
    EXPECT_EQ(moved.bytes(), 30u);
    moved = Reservation();
    EXPECT_EQ(budget.reserved(), 0u);
}

TEST(MemoryBudget, RefusesAtOnceWhatItCanNeverGive) {
    MemoryBudget budget(100);
    EXPECT_THROW(budget.reserve(101), std::length_error);
    EXPECT_EQ(budget.reserve(100).bytes(), 100u);
}

TEST(MemoryBudget, IsOutlivedByReservations) {
    std::optional<Reservation> held;
    {
        MemoryBudget budget(100);
        held = budget.tryReserve(10);
    }
    EXPECT_EQ(held->bytes(), 10u);
}

TEST(MemoryBudget, LetsWhoeverWaitsForMuchGoAheadOfLaterOnesThatWouldFit) {
    MemoryBudget budget(100);
    std::optional<Reservation> first = budget.tryReserve(50);
    std::future<Reservation> large =
        std::async(std::launch::async, [&] { return budget.reserve(80); });
    // Until the large one waits, small ones are served.
    while (budget.tryReserve(10)) {
        std::this_thread::yield();
    }
    std::future<Reservation> small =
        std::async(std::launch::async, [&] { return budget.reserve(30); });
    first.reset();
    {
        const Reservation served = large.get();
        EXPECT_EQ(served.bytes(), 80u);
        EXPECT_EQ(small.wait_for(std::chrono::milliseconds(20)), std::future_status::timeout);
    }
    EXPECT_EQ(small.get().bytes(), 30u);
    EXPECT_EQ(budget.reserved(), 0u);
    EXPECT_TRUE(budget.tryReserve(10));
}

TEST(MemoryBudget, TellsWhenThereIsRoomAgain) {
    MemoryBudget budget(100);
    int calls = 0;
    std::optional<Reservation> held = budget.tryReserve(100);
    std::optional<Reservation> next;
    {
        const auto watch = budget.onRoom([&] {
            ++calls;
            next = budget.tryReserve(10);
        });
        EXPECT_EQ(calls, 0);
        held->shrink(90);
        EXPECT_EQ(calls, 1);
        EXPECT_TRUE(next);
    }
    held.reset();
    EXPECT_EQ(calls, 1);
}

TEST(MemoryBudget, IsNeverExceededByManyThreads) {
    constexpr std::size_t size = 1000;
    MemoryBudget budget(size);
    std::atomic<std::size_t> held = 0;
    std::atomic<std::size_t> most = 0;
    const auto use = [&](const Reservation& reservation) {
        const std::size_t now = held += reservation.bytes();
        for (std::size_t seen = most; seen < now && !most.compare_exchange_weak(seen, now);) {
        }
        std::this_thread::yield();
        held -= reservation.bytes();
    };
    std::vector<std::thread> threads;
    for (unsigned seed = 0; seed < 8; ++seed) {
        threads.emplace_back([&, seed] {
            std::minstd_rand random(seed + 1);
            for (int i = 0; i < 500; ++i) {
                const std::size_t bytes = random() % size + 1;
                if (seed % 2 == 0) {
                    use(budget.reserve(bytes));
                } else if (const auto reservation = budget.tryReserve(bytes)) {
                    use(*reservation);
                }
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_LE(most, size);
    EXPECT_GT(most, 0u);
    EXPECT_EQ(budget.reserved(), 0u);
}

}  // namespace
}  // namespace platform::messaging
