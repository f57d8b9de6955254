// SPDX-License-Identifier: Apache-2.0
// Functions that are revoked while they are called, from outside and from inside.

#include "platform/messaging/revocable_function.h"

#include <gtest/gtest.h>

#include <functional>
#include <latch>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace platform::messaging {
namespace {

TEST(RevocableFunction, PassesArgumentsAsTheyAre) {
    const std::string text = "same";
    const std::string* given = nullptr;
    std::unique_ptr<int> moved;
    RevocableFunction<const std::string&, std::unique_ptr<int>> function(
        [&](const std::string& reference, std::unique_ptr<int> value) {
            given = &reference;
            moved = std::move(value);
        });
    function(text, std::make_unique<int>(5));
    EXPECT_EQ(given, &text);
    EXPECT_EQ(*moved, 5);
}

TEST(RevocableFunction, LetsExceptionsPassAndMayBeCalledAgain) {
    int calls = 0;
    RevocableFunction<> function([&] {
        ++calls;
        throw std::runtime_error("from the function");
    });
    EXPECT_THROW(function(), std::runtime_error);
    EXPECT_THROW(function(), std::runtime_error);
    EXPECT_EQ(calls, 2);
    function.revoke();  // waits for no call that ended with an exception
}

TEST(RevocableFunction, IsDestroyedAndNotCalledOnceRevoked) {
    int calls = 0;
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    RevocableFunction<> function([&calls, held = std::move(held)] { ++calls; });
    function.revoke();
    EXPECT_TRUE(alive.expired());
    function();
    EXPECT_EQ(calls, 0);
}

TEST(RevocableFunction, WaitsForTheCallsOnOtherThreads) {
    for (int round = 0; round < 200; ++round) {
        std::latch entered(2);
        int first = 0;  // not atomic: the revocation has to order the accesses
        int second = 0;
        RevocableFunction<int&> function([&](int& done) {
            entered.arrive_and_wait();
            std::this_thread::yield();
            done = 1;
        });
        std::thread firstCaller([&] { function(first); });
        std::thread secondCaller([&] { function(second); });
        entered.wait();
        function.revoke();
        EXPECT_EQ(first + second, 2);
        firstCaller.join();
        secondCaller.join();
    }
}

TEST(RevocableFunction, MayRevokeItself) {
    auto held = std::make_shared<int>(7);
    const std::weak_ptr<int> alive = held;
    int seen = 0;
    std::optional<RevocableFunction<>> function;
    function.emplace([&, held = std::move(held)] {
        function->revoke();
        seen = *held;
    });
    (*function)();
    EXPECT_EQ(seen, 7) << "the function lives as long as its call";
    EXPECT_TRUE(alive.expired());
    (*function)();
}

TEST(RevocableFunction, MayRevokeItselfInANestedCall) {
    auto held = std::make_shared<int>(0);
    const std::weak_ptr<int> alive = held;
    std::vector<std::string> events;
    std::optional<RevocableFunction<int>> function;
    function.emplace([&, held = std::move(held)](int depth) {
        if (depth == 2) {
            function->revoke();
        } else {
            (*function)(depth + 1);
        }
        events.push_back(std::to_string(depth) + (alive.expired() ? " destroyed" : " alive"));
    });
    (*function)(0);
    EXPECT_EQ(events, (std::vector<std::string>{"2 alive", "1 alive", "0 alive"}));
    EXPECT_TRUE(alive.expired());
}

TEST(RevocableFunction, WaitsForOtherThreadsWhenItRevokesItself) {
    for (int round = 0; round < 200; ++round) {
        std::latch bothInside(2);
        int other = 0;
        std::optional<RevocableFunction<bool>> function;
        function.emplace([&](bool revokes) {
            bothInside.arrive_and_wait();
            if (revokes) {
                function->revoke();
                EXPECT_EQ(other, 1);
            } else {
                std::this_thread::yield();
                other = 1;
            }
        });
        std::thread caller([&] { (*function)(false); });
        (*function)(true);
        caller.join();
    }
}

// Its destructor uses the function that it belongs to.
class CallsBack {
public:
    explicit CallsBack(std::function<void()> callBack) : callBack_(std::move(callBack)) {}
    ~CallsBack() { callBack_(); }
    CallsBack(const CallsBack&) = delete;
    CallsBack& operator=(const CallsBack&) = delete;

private:
    std::function<void()> callBack_;
};

TEST(RevocableFunction, IsDestroyedUnlocked) {
    int ends = 0;
    std::optional<RevocableFunction<>> function;
    const auto callBack = [&] {
        (*function)();
        ++ends;
    };
    function.emplace([held = std::make_shared<CallsBack>(callBack)] {});
    function->revoke();
    EXPECT_EQ(ends, 1);

    function.emplace([&, held = std::make_shared<CallsBack>(callBack)] { function->revoke(); });
    (*function)();
    EXPECT_EQ(ends, 2);
}

}  // namespace
}  // namespace platform::messaging
