// SPDX-License-Identifier: Apache-2.0
// Futures under contention; meant for the thread sanitizer as much as for the assertions.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <barrier>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "futures/future.h"

namespace futures {
namespace {

using testing::AnyOf;
using testing::StrEq;

// Runs the actions of each round at once, each on a thread of its own, over and over.
void race(int rounds, const std::function<std::vector<std::function<void()>>()>& begin,
          const std::function<void()>& end) {
    std::vector<std::function<void()>> actions = begin();
    const std::size_t count = actions.size();
    std::barrier barrier(static_cast<std::ptrdiff_t>(count) + 1);
    std::vector<std::thread> threads;
    for (std::size_t index = 0; index < count; ++index) {
        threads.emplace_back([&, index] {
            for (int round = 0; round < rounds; ++round) {
                barrier.arrive_and_wait();
                actions[index]();
                barrier.arrive_and_wait();
            }
        });
    }
    for (int round = 0; round < rounds; ++round) {
        if (round != 0) {
            actions = begin();
        }
        barrier.arrive_and_wait();
        barrier.arrive_and_wait();
        end();
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
}

// "value" or the text of the exception.
std::string outcomeOf(const std::function<void()>& operation) {
    try {
        operation();
        return "value";
    } catch (const std::exception& caught) {
        return caught.what();
    }
}

// Thrown rather than copied: the copy would share its text with the original, under a count of the
// standard library's that the thread sanitizer does not see.
std::exception_ptr failure(const char* text) {
    return detail::exceptionOf([text] { throw std::logic_error(text); });
}

constexpr const char* resolvedText = "Promise already resolved.";
constexpr const char* cancelledText = "Future has been cancelled.";
constexpr const char* getTakenText =
    "Future already returned it's value or has an associated continuation.";
constexpr const char* thenTakenText =
    "Future already has returned it's value or has an associated continuation.";

using State = detail::SharedFutureState<std::unique_ptr<int>>;

TEST(FutureRace, GivesTheOutcomeOfOneSetterToOneTaker) {
    std::shared_ptr<State> state;
    std::string setValue;
    std::string setException;
    std::string get;
    std::string then;
    std::string result;
    const auto begin = [&]() -> std::vector<std::function<void()>> {
        state = std::make_shared<State>();
        result.clear();
        return {
            [&] { setValue = outcomeOf([&] { state->setValue(std::make_unique<int>(1)); }); },
            [&] { setException = outcomeOf([&] { state->setException(failure("set")); }); },
            [&] { get = outcomeOf([&] { Future<std::unique_ptr<int>>(state).get(); }); },
            [&] {
                then = outcomeOf([&] {
                    Future<std::unique_ptr<int>> next = Future<std::unique_ptr<int>>(state).then(
                        [](Future<std::unique_ptr<int>> future) { return future.get(); });
                    result = outcomeOf([&] { next.get(); });
                });
            },
        };
    };
    const auto end = [&] {
        // One setter wins.
        EXPECT_NE(setValue == "value", setException == "value");
        const char* won = setValue == "value" ? "value" : "set";
        EXPECT_EQ(setValue == "value" ? setException : setValue, resolvedText);
        // One taker gets the value, and the other the error.
        EXPECT_THAT(get, AnyOf(StrEq(won), StrEq(getTakenText)));
        EXPECT_THAT(then, AnyOf(StrEq("value"), StrEq(thenTakenText)));
        if (then == "value") {
            EXPECT_THAT(result, AnyOf(StrEq(won), StrEq(getTakenText)));
        }
        EXPECT_NE(get == won, result == won) << get << '/' << then << '/' << result;
    };
    race(3000, begin, end);
}

TEST(FutureRace, EitherCancelsOrGivesTheOutcome) {
    std::shared_ptr<State> state;
    std::string set;
    std::string get;
    std::string then;
    std::string result;
    const auto begin = [&]() -> std::vector<std::function<void()>> {
        state = std::make_shared<State>();
        result.clear();
        return {
            [&] { set = outcomeOf([&] { state->setValue(std::make_unique<int>(1)); }); },
            [&] { Future<std::unique_ptr<int>>(state).cancel(); },
            [&] { get = outcomeOf([&] { Future<std::unique_ptr<int>>(state).get(); }); },
            [&] {
                then = outcomeOf([&] {
                    Future<std::unique_ptr<int>> next = Future<std::unique_ptr<int>>(state).then(
                        [](Future<std::unique_ptr<int>> future) { return future.get(); });
                    result = outcomeOf([&] { next.get(); });
                });
            },
        };
    };
    const auto end = [&] {
        EXPECT_EQ(set, "value") << "a cancelled state drops the outcome silently";
        const bool cancelled = state->status == detail::FutureStatus::cancelled;
        const char* outcome = cancelled ? cancelledText : "value";
        EXPECT_THAT(get, AnyOf(StrEq(outcome), StrEq(getTakenText)));
        EXPECT_THAT(then, AnyOf(StrEq("value"), StrEq(thenTakenText)));
        if (then == "value") {
            EXPECT_THAT(result, AnyOf(StrEq(outcome), StrEq(getTakenText)));
        }
        EXPECT_NE(get == outcome, result == outcome) << get << '/' << then << '/' << result;
    };
    race(3000, begin, end);
}

TEST(FutureRace, RunsTheContinuationOnceWhetherItOrTheOutcomeComesFirst) {
    std::unique_ptr<Promise<int>> promise;
    Future<int> future;
    std::atomic<int> runs = 0;
    Future<int> result;
    const auto begin = [&]() -> std::vector<std::function<void()>> {
        promise = std::make_unique<Promise<int>>();
        future = promise->getFuture();
        runs = 0;
        return {
            [&] { promise->setValue(21); },
            [&] {
                result = future.then([&](Future<int> resolved) {
                    ++runs;
                    return 2 * resolved.get();
                });
            },
        };
    };
    const auto end = [&] {
        EXPECT_EQ(result.get(), 42);
        EXPECT_EQ(runs, 1);
    };
    race(3000, begin, end);
}

TEST(FutureRace, WakesAWaiterThatOutlivesThePromise) {
    std::unique_ptr<Promise<std::string>> promise;
    Future<std::string> future;
    std::string got;
    int round = 0;
    const auto begin = [&]() -> std::vector<std::function<void()>> {
        promise = std::make_unique<Promise<std::string>>();
        future = promise->getFuture();
        ++round;
        return {
            [&] {
                if (round % 2 == 0) {
                    promise->setValue("value");
                }
                promise.reset();
            },
            [&] { got = outcomeOf([&] { future.get(); }); },
        };
    };
    race(3000, begin, [&] { EXPECT_EQ(got, round % 2 == 0 ? "value" : cancelledText); });
}

TEST(FutureRace, UnwrapsWhicheverResolvesFirst) {
    std::unique_ptr<Promise<Future<void>>> outer;
    std::unique_ptr<Promise<void>> inner;
    Future<Future<void>> outerFuture;
    Future<void> innerFuture;
    std::string outcome;
    const auto begin = [&]() -> std::vector<std::function<void()>> {
        outer = std::make_unique<Promise<Future<void>>>();
        inner = std::make_unique<Promise<void>>();
        outerFuture = outer->getFuture();
        innerFuture = inner->getFuture();
        return {
            [&] { outer->setValue(std::move(innerFuture)); },
            [&] { inner->setException(failure("inner")); },
            [&] { outcome = outcomeOf([&] { unwrap(std::move(outerFuture)).get(); }); },
        };
    };
    race(3000, begin, [&] { EXPECT_EQ(outcome, "inner"); });
}

// Resolves what it is given on a thread of its own, as a remote service would.
class Service {
public:
    Service() : thread_([this] { work(); }) {}

    ~Service() {
        post(nullptr);
        thread_.join();
    }

    Service(const Service&) = delete;
    Service& operator=(const Service&) = delete;

    Future<std::string> request(const std::string& name) {
        auto promise = std::make_shared<Promise<std::string>>();
        Future<std::string> answer = promise->getFuture();
        post([promise, name] {
            if (name == "refused") {
                promise->setException(failure(name.c_str()));
            } else {
                promise->setValue("handle of " + name);
            }
        });
        return answer;
    }

private:
    void post(std::function<void()> task) {
        const std::lock_guard lock(mutex_);
        tasks_.push_back(std::move(task));
        changed_.notify_one();
    }

    void work() {
        while (true) {
            std::unique_lock lock(mutex_);
            changed_.wait(lock, [this] { return !tasks_.empty(); });
            const std::function<void()> task = std::move(tasks_.front());
            tasks_.pop_front();
            lock.unlock();
            if (!task) {
                return;
            }
            task();
        }
    }

    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::function<void()>> tasks_;
    std::thread thread_;
};

// A start-up: once there is a service, its continuation asks it twice, waiting for each answer.
struct StartUp {
    std::string first;
    std::string second;

    Future<void> begin(Future<Service*> creation, const std::string& firstName,
                       const std::string& secondName) {
        auto done = std::make_shared<Promise<void>>();
        Future<void> future = done->getFuture();
        creation.then([this, done, firstName, secondName](Future<Service*> created) {
            try {
                Service& service = *created.get();
                first = service.request(firstName).get();
                second = service.request(secondName).get();
                done->setValue();
            } catch (...) {
                done->setException(std::current_exception());
            }
        });
        return future;
    }
};

TEST(FutureStartUp, MayWaitForOtherFuturesInAContinuation) {
    Service service;
    constexpr std::size_t count = 16;
    std::vector<StartUp> startUps(count);
    std::vector<Promise<Service*>> creations(count);
    std::vector<Future<void>> done;
    for (std::size_t index = 0; index < count; ++index) {
        done.push_back(startUps[index].begin(creations[index].getFuture(),
                                             "read " + std::to_string(index), "write"));
    }
    std::vector<std::thread> creators;
    for (Promise<Service*>& creation : creations) {
        creators.emplace_back([&] { creation.setValue(&service); });
    }
    for (std::size_t index = 0; index < count; ++index) {
        EXPECT_NO_THROW(done[index].get());
        EXPECT_EQ(startUps[index].first, "handle of read " + std::to_string(index));
        EXPECT_EQ(startUps[index].second, "handle of write");
    }
    for (std::thread& creator : creators) {
        creator.join();
    }
}

TEST(FutureStartUp, MayWaitForOtherFuturesWhenAttachedLate) {
    Service service;
    Promise<Service*> creation;
    creation.setValue(&service);
    StartUp startUp;
    Future<void> done = startUp.begin(creation.getFuture(), "read", "write");
    EXPECT_EQ(startUp.second, "handle of write");
    EXPECT_NO_THROW(done.get());
}

TEST(FutureStartUp, EndsAtTheFirstFailure) {
    Service service;
    Promise<Service*> creation;
    creation.setValue(&service);
    StartUp startUp;
    Future<void> done = startUp.begin(creation.getFuture(), "refused", "write");
    EXPECT_EQ(outcomeOf([&] { done.get(); }), "refused");
    EXPECT_EQ(startUp.second, "");
}

}  // namespace
}  // namespace futures
