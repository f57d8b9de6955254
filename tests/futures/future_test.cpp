// SPDX-License-Identifier: Apache-2.0
// Promises, futures, continuations and unwrap as their users see them.

#include "futures/future.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <exception>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

namespace futures {
namespace {

using testing::ElementsAre;
using testing::StrEq;
using testing::ThrowsMessage;

constexpr const char* invalidText = "Future state isn't valid!";
constexpr const char* getTakenText =
    "Future already returned it's value or has an associated continuation.";
constexpr const char* thenTakenText =
    "Future already has returned it's value or has an associated continuation.";
constexpr const char* cancelledText = "Future has been cancelled.";
constexpr const char* resolvedText = "Promise already resolved.";
constexpr const char* retrievedText = "Promise already returned a future.";

// What is expected to throw, as one type: the matchers would be compiled anew for each lambda.
using Call = std::function<void()>;

auto failsWith(const char* text) {
    return ThrowsMessage<std::runtime_error>(StrEq(text));
}

std::exception_ptr failure(const std::string& text) {
    return std::make_exception_ptr(std::invalid_argument(text));
}

auto rethrows(const char* text) {
    return ThrowsMessage<std::invalid_argument>(StrEq(text));
}

static_assert(std::is_nothrow_move_constructible_v<Future<int>>);
static_assert(std::is_nothrow_move_assignable_v<Future<int>>);
static_assert(!std::is_copy_constructible_v<Future<int>>);
static_assert(!std::is_copy_assignable_v<Future<int>>);
static_assert(std::is_nothrow_move_constructible_v<Promise<int>>);
static_assert(std::is_nothrow_move_assignable_v<Promise<int>>);
static_assert(!std::is_copy_constructible_v<Promise<int>>);
static_assert(!std::is_copy_assignable_v<Promise<int>>);

// A value that can only be moved, and counts how often it was.
struct Counted {
    explicit Counted(int number) : value(number) {}
    Counted(Counted&& other) noexcept : value(other.value), moves(other.moves + 1) {}
    Counted& operator=(Counted&&) = delete;
    Counted(const Counted&) = delete;
    Counted& operator=(const Counted&) = delete;
    ~Counted() = default;

    int value;
    int moves = 0;
};

TEST(Promise, HandsOutItsFutureOnce) {
    Promise<int> promise;
    EXPECT_TRUE(promise.getFuture().valid());
    EXPECT_THAT(Call([&] { promise.getFuture(); }), failsWith(retrievedText));
}

TEST(Promise, HandsOutItsFutureAfterItIsResolved) {
    Promise<int> promise;
    promise.setValue(5);
    EXPECT_EQ(promise.getFuture().get(), 5);
}

TEST(Promise, KeepsTheFirstOutcomeAndRefusesASecond) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    promise.setValue(1);
    EXPECT_THAT(Call([&] { promise.setValue(2); }), failsWith(resolvedText));
    EXPECT_THAT(Call([&] { promise.setException(failure("late")); }), failsWith(resolvedText));
    EXPECT_EQ(future.get(), 1);
}

TEST(Promise, KeepsTheFirstExceptionAndRefusesASecondOutcome) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    promise.setException(failure("first"));
    EXPECT_THAT(Call([&] { promise.setValue(2); }), failsWith(resolvedText));
    EXPECT_THAT(Call([&] { promise.setException(failure("late")); }), failsWith(resolvedText));
    EXPECT_THAT(Call([&] { future.get(); }), rethrows("first"));
}

TEST(Promise, OfVoidRefusesASecondOutcome) {
    Promise<void> promise;
    promise.setValue();
    EXPECT_THAT(Call([&] { promise.setValue(); }), failsWith(resolvedText));
    EXPECT_THAT(Call([&] { promise.setException(failure("late")); }), failsWith(resolvedText));
    EXPECT_NO_THROW(promise.getFuture().get());
}

TEST(Promise, DropsTheOutcomeOfACancelledStateSilently) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    future.cancel();
    EXPECT_NO_THROW(promise.setValue(1));
    EXPECT_NO_THROW(promise.setException(failure("late")));
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(cancelledText));
}

TEST(Promise, CancelsItsStateWhenDestroyedPending) {
    Future<int> future;
    {
        Promise<int> promise;
        future = promise.getFuture();
    }
    EXPECT_TRUE(future.valid());
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(cancelledText));
}

TEST(Promise, WakesAWaiterWhenDestroyedPending) {
    auto promise = std::make_unique<Promise<int>>();
    Future<int> future = promise->getFuture();
    std::thread destroyer([&] { promise.reset(); });
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(cancelledText));
    destroyer.join();
}

TEST(Promise, LeavesItsOutcomeBehindWhenDestroyed) {
    Future<std::string> future;
    {
        Promise<std::string> promise;
        future = promise.getFuture();
        promise.setValue("kept");
    }
    EXPECT_EQ(future.get(), "kept");
}

TEST(Promise, MovesItsState) {
    Promise<int> first;
    Future<int> future = first.getFuture();
    Promise<int> second(std::move(first));
    EXPECT_THAT(Call([&] { second.getFuture(); }), failsWith(retrievedText));
    second.setValue(3);
    EXPECT_EQ(future.get(), 3);
}

TEST(Promise, CancelsTheStateThatAMoveReplaces) {
    Promise<int> target;
    Future<int> replaced = target.getFuture();
    Promise<int> source;
    Future<int> moved = source.getFuture();
    target = std::move(source);
    EXPECT_THAT(Call([&] { replaced.get(); }), failsWith(cancelledText));
    target.setValue(4);
    EXPECT_EQ(moved.get(), 4);
}

TEST(Promise, SurvivesASelfMove) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    Promise<int>& alias = promise;
    promise = std::move(alias);
    promise.setValue(6);
    EXPECT_EQ(future.get(), 6);
}

TEST(Promise, FailsWhenMovedFrom) {
    constexpr const char* text = "Promise state isn't valid!";
    Promise<int> promise;
    const Promise<int> target(std::move(promise));
    EXPECT_THAT(Call([&] { promise.getFuture(); }),
                failsWith(text));  // NOLINT(bugprone-use-after-move)
    EXPECT_THAT(Call([&] { promise.setValue(1); }),
                failsWith(text));  // NOLINT(bugprone-use-after-move)
    EXPECT_THAT(Call([&] { promise.setException(failure("")); }), failsWith(text));
}

TEST(Promise, MayBeDestroyedByItsOwnContinuation) {
    auto promise = std::make_unique<Promise<int>>();
    int seen = 0;
    promise->getFuture().then([&](Future<int> future) {
        promise.reset();
        seen = future.get();
    });
    promise->setValue(8);
    EXPECT_EQ(seen, 8);
    EXPECT_EQ(promise, nullptr);
}

TEST(Future, IsInvalidByDefault) {
    Future<int> future;
    EXPECT_FALSE(future.valid());
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(invalidText));
    EXPECT_THAT(Call([&] { future.then([](Future<int>) {}); }), failsWith(invalidText));
    EXPECT_THAT(Call([&] { future.cancel(); }), failsWith(invalidText));
}

TEST(Future, OfVoidIsInvalidByDefault) {
    Future<void> future;
    EXPECT_FALSE(future.valid());
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(invalidText));
    EXPECT_THAT(Call([&] { future.then([](Future<void>) {}); }), failsWith(invalidText));
}

TEST(Future, IsInvalidAfterGet) {
    Promise<int> promise;
    promise.setValue(1);
    Future<int> future = promise.getFuture();
    future.get();
    EXPECT_FALSE(future.valid());
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(invalidText));
}

TEST(Future, IsInvalidAfterAGetThatThrew) {
    Promise<int> promise;
    promise.setException(failure("no"));
    Future<int> future = promise.getFuture();
    EXPECT_THAT(Call([&] { future.get(); }), rethrows("no"));
    EXPECT_FALSE(future.valid());
}

TEST(Future, IsInvalidWhenMovedFrom) {
    Promise<int> promise;
    promise.setValue(1);
    Future<int> source = promise.getFuture();
    Future<int> target(std::move(source));
    EXPECT_FALSE(source.valid());  // NOLINT(bugprone-use-after-move)
    EXPECT_THAT(Call([&] { source.get(); }), failsWith(invalidText));
    EXPECT_EQ(target.get(), 1);
}

TEST(Future, SurvivesASelfMove) {
    Promise<int> promise;
    promise.setValue(1);
    Future<int> future = promise.getFuture();
    Future<int>& alias = future;
    future = std::move(alias);
    EXPECT_TRUE(future.valid());
    EXPECT_EQ(future.get(), 1);
}

TEST(Future, WaitsForTheValue) {
    Promise<std::string> promise;
    Future<std::string> future = promise.getFuture();
    std::thread resolver([&] { promise.setValue("from another thread"); });
    EXPECT_EQ(future.get(), "from another thread");
    resolver.join();
}

TEST(Future, WaitsForTheException) {
    Promise<void> promise;
    Future<void> future = promise.getFuture();
    std::thread resolver([&] { promise.setException(failure("far away")); });
    EXPECT_THAT(Call([&] { future.get(); }), rethrows("far away"));
    resolver.join();
}

TEST(Future, WaitsForTheCancellation) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    Future<int> future(state);
    std::thread canceller([&] { Future<int>(state).cancel(); });
    EXPECT_THAT(Call([&] { future.get(); }), failsWith(cancelledText));
    canceller.join();
}

TEST(Future, MovesTheValueAndNeverCopiesIt) {
    Promise<Counted> promise;
    promise.setValue(Counted(7));
    const Counted value = promise.getFuture().get();
    EXPECT_EQ(value.value, 7);
    EXPECT_LE(value.moves, 3);
}

TEST(Future, HoldsMoveOnlyValues) {
    Promise<std::unique_ptr<int>> promise;
    promise.setValue(std::make_unique<int>(9));
    EXPECT_EQ(*promise.getFuture().get(), 9);
}

TEST(Future, HoldsAnExceptionAsAValue) {
    Promise<std::exception_ptr> promise;
    promise.setValue(failure("a value"));
    const std::exception_ptr value = promise.getFuture().get();
    EXPECT_THAT(Call([&] { std::rethrow_exception(value); }), rethrows("a value"));
}

TEST(Future, GivesAnOutcomeToOneOfSeveralGets) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    state->setValue(1);
    EXPECT_EQ(Future<int>(state).get(), 1);
    EXPECT_THAT(Call([&] { Future<int>(state).get(); }), failsWith(getTakenText));
}

TEST(Future, RefusesGetWhileAContinuationIsAttached) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    Future<int>(state).then([](Future<int>) {});
    EXPECT_THAT(Call([&] { Future<int>(state).get(); }), failsWith(getTakenText));
}

TEST(Future, RefusesThenAfterGet) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    state->setValue(1);
    Future<int>(state).get();
    EXPECT_THAT(Call([&] { Future<int>(state).then([](Future<int>) {}); }),
                failsWith(thenTakenText));
}

TEST(Future, RefusesThenAfterThen) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    Future<int>(state).then([](Future<int>) {});
    EXPECT_THAT(Call([&] { Future<int>(state).then([](Future<int>) {}); }),
                failsWith(thenTakenText));
}

TEST(Future, StaysValidAndReadableWhenCancelledTooLate) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    promise.setValue(2);
    future.cancel();
    EXPECT_TRUE(future.valid());
    EXPECT_EQ(future.get(), 2);
}

TEST(Then, ConsumesTheFuture) {
    Promise<int> promise;
    Future<int> future = promise.getFuture();
    future.then([](Future<int>) {});
    EXPECT_FALSE(future.valid());
    EXPECT_THAT(Call([&] { future.then([](Future<int>) {}); }), failsWith(invalidText));
}

TEST(Then, ConsumesTheFutureButNotTheCallbackWhenItThrows) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    Future<int>(state).then([](Future<int>) {});
    Future<int> future(state);
    auto callback = [kept = std::make_unique<int>(3)](Future<int>) { return kept ? *kept : 0; };
    EXPECT_THAT(Call([&] { future.then(std::move(callback)); }), failsWith(thenTakenText));
    EXPECT_FALSE(future.valid());
    EXPECT_EQ(callback(Future<int>()), 3);  // NOLINT(bugprone-use-after-move)
}

TEST(Then, RunsAtOnceOnTheAttachingThreadWhenResolved) {
    Promise<int> promise;
    std::thread([&] { promise.setValue(5); }).join();
    std::thread::id ranOn;
    promise.getFuture().then([&](Future<int>) { ranOn = std::this_thread::get_id(); });
    EXPECT_EQ(ranOn, std::this_thread::get_id());
}

TEST(Then, RunsOnTheResolvingThreadWhenPending) {
    Promise<int> promise;
    std::thread::id ranOn;
    Future<void> done =
        promise.getFuture().then([&](Future<int>) { ranOn = std::this_thread::get_id(); });
    EXPECT_EQ(ranOn, std::thread::id());
    std::thread resolver([&] { promise.setValue(5); });
    const std::thread::id resolvedOn = resolver.get_id();
    done.get();
    resolver.join();
    EXPECT_EQ(ranOn, resolvedOn);
}

TEST(Then, GivesTheCallbackAReadableFuture) {
    Promise<std::string> promise;
    Future<std::string> result = promise.getFuture().then([](Future<std::string> future) {
        EXPECT_TRUE(future.valid());
        return future.get() + "!";
    });
    promise.setValue("read");
    EXPECT_EQ(result.get(), "read!");
}

TEST(Then, GivesTheCallbackTheException) {
    Promise<int> promise;
    Future<std::string> result = promise.getFuture().then([](Future<int> future) -> std::string {
        try {
            future.get();
        } catch (const std::invalid_argument& caught) {
            return caught.what();
        }
        return "nothing";
    });
    promise.setException(failure("caught here"));
    EXPECT_EQ(result.get(), "caught here");
}

TEST(Then, DeliversTheValueOfTheCallback) {
    Promise<void> promise;
    Future<std::unique_ptr<int>> result =
        promise.getFuture().then([](Future<void>) { return std::make_unique<int>(11); });
    promise.setValue();
    EXPECT_EQ(*result.get(), 11);
}

TEST(Then, DeliversTheEndOfACallbackWithoutResult) {
    Promise<int> promise;
    int seen = 0;
    Future<void> result =
        promise.getFuture().then([&](Future<int> future) { seen = future.get(); });
    promise.setValue(12);
    EXPECT_NO_THROW(result.get());
    EXPECT_EQ(seen, 12);
}

TEST(Then, DeliversTheExceptionOfTheCallback) {
    Promise<int> promise;
    Future<int> value = promise.getFuture().then([](Future<int> future) { return future.get(); });
    Future<void> nothing = value.then([](Future<int> future) { future.get(); });
    EXPECT_NO_THROW(promise.setException(failure("all the way")));
    EXPECT_THAT(Call([&] { nothing.get(); }), rethrows("all the way"));
}

TEST(Then, DeliversExceptionsOfAnyType) {
    Promise<void> promise;
    Future<int> result = promise.getFuture().then([](Future<void>) -> int { throw 42; });
    EXPECT_NO_THROW(promise.setValue());
    EXPECT_THROW(result.get(), int);
}

TEST(Then, DeliversAReferencedResultAsACopy) {
    Promise<void> promise;
    std::string text = "before";
    Future<std::string> result =
        promise.getFuture().then([&](Future<void>) -> const std::string& { return text; });
    promise.setValue();
    text = "after";
    EXPECT_EQ(result.get(), "before");
}

int twice(Future<int> future) {
    return 2 * future.get();
}

TEST(Then, TakesAnyKindOfCallback) {
    const auto resolved = [](int value) {
        Promise<int> promise;
        promise.setValue(value);
        return promise.getFuture();
    };
    EXPECT_EQ(resolved(1).then(twice).get(), 2);
    EXPECT_EQ(resolved(2).then(std::function<int(Future<int>)>(twice)).get(), 4);
    EXPECT_EQ(resolved(3).then([](Future<int>&& future) { return future.get(); }).get(), 3);
    EXPECT_TRUE(resolved(4).then([](const Future<int>& future) { return future.valid(); }).get());
    EXPECT_EQ(resolved(5)
                  .then([held = std::make_unique<int>(5)](Future<int> future) mutable {
                      return *held + future.get();
                  })
                  .get(),
              10);
}

TEST(Then, PassesAFutureThatTheCallbackReturnsOn) {
    Promise<void> outer;
    Promise<int> inner;
    Future<Future<int>> result =
        outer.getFuture().then([&](Future<void>) { return inner.getFuture(); });
    outer.setValue();
    inner.setValue(13);
    EXPECT_EQ(result.get().get(), 13);
}

TEST(Then, RunsAChainInOrder) {
    Promise<int> promise;
    std::vector<int> seen;
    Future<int> last = promise.getFuture();
    for (int link = 0; link < 100; ++link) {
        last = last.then([&seen](Future<int> future) {
            seen.push_back(future.get());
            return seen.back() + 1;
        });
    }
    EXPECT_TRUE(seen.empty());
    promise.setValue(0);
    EXPECT_EQ(last.get(), 100);
    for (int link = 0; link < 100; ++link) {
        EXPECT_EQ(seen[static_cast<std::size_t>(link)], link);
    }
}

TEST(Then, DestroysTheCallbackBeforeTheResolvingCallReturns) {
    Promise<int> promise;
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    promise.getFuture().then([held = std::move(held)](Future<int>) {});
    EXPECT_FALSE(alive.expired());
    promise.setValue(1);
    EXPECT_TRUE(alive.expired());
}

TEST(Then, LetsTheCallbackUseThePromiseAndItsState) {
    Promise<int> promise;
    std::vector<std::string> texts;
    promise.getFuture().then([&](Future<int> future) {
        try {
            promise.setValue(2);
        } catch (const std::runtime_error& refused) {
            texts.emplace_back(refused.what());
        }
        Future<int> again = promise.getFuture();
        texts.push_back(std::to_string(future.get()));
        try {
            again.get();
        } catch (const std::runtime_error& refused) {
            texts.emplace_back(refused.what());
        }
    });
    promise.setValue(1);
    EXPECT_THAT(texts, ElementsAre(resolvedText, "1", getTakenText));
}

TEST(Then, LetsTheCallbackAttachAnotherOne) {
    Promise<int> promise;
    int seen = 0;
    promise.getFuture().then([&](Future<int> future) {
        future.then([&](Future<int> sameOutcome) { seen = sameOutcome.get(); });
    });
    promise.setValue(14);
    EXPECT_EQ(seen, 14);
}

TEST(Then, IsCancelledWithItsFuture) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    bool called = false;
    Future<void> result =
        Future<int>(state).then([&called, held = std::move(held)](Future<int>) { called = true; });
    state->cancel();
    EXPECT_TRUE(alive.expired());
    EXPECT_THAT(Call([&] { result.get(); }), failsWith(cancelledText));
    EXPECT_FALSE(called);
}

TEST(Then, IsCancelledWhenTheFutureAlreadyIs) {
    const auto state = std::make_shared<detail::SharedFutureState<int>>();
    state->cancel();
    bool called = false;
    Future<void> result = Future<int>(state).then([&called](Future<int>) { called = true; });
    EXPECT_THAT(Call([&] { result.get(); }), failsWith(cancelledText));
    EXPECT_FALSE(called);
}

TEST(Then, IsCancelledAllAlongTheChainWhenThePromiseIsDestroyed) {
    auto promise = std::make_unique<Promise<int>>();
    int calls = 0;
    Future<int> last = promise->getFuture();
    for (int link = 0; link < 100; ++link) {
        last = last.then([&calls](Future<int> future) {
            ++calls;
            return future.get();
        });
    }
    promise.reset();
    EXPECT_THAT(Call([&] { last.get(); }), failsWith(cancelledText));
    EXPECT_EQ(calls, 0);
}

TEST(Then, IsCancelledAfterItsCallbackIsGone) {
    auto promise = std::make_unique<Promise<int>>();
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = held;
    bool aliveAtTheEnd = true;
    // The result's continuation is destroyed when the result is cancelled.
    const auto noticeEnd = [&](const int*) { aliveAtTheEnd = !alive.expired(); };
    promise->getFuture()
        .then([held = std::move(held)](Future<int>) {})
        .then([end = std::shared_ptr<const int>(nullptr, noticeEnd)](Future<void>) {});
    promise.reset();
    EXPECT_FALSE(aliveAtTheEnd);
}

TEST(ThenDeathTest, EndsTheProcessWhenTheCallbacksDestructorThrows) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    struct Destructor {
        bool* armed;
        void operator()(Future<int>) { *armed = true; }
        ~Destructor() noexcept(false) {
            if (*armed) {
                throw std::runtime_error("from a destructor");
            }
        }
    };
    EXPECT_DEATH(
        {
            Promise<int> promise;
            bool armed = false;
            promise.getFuture().then(Destructor{&armed});
            try {
                promise.setValue(1);
            } catch (...) {
                std::_Exit(0);
            }
        },
        "terminate");
}

enum class Ending { value, exception, cancelled, invalid };

// The outcome of unwrap's result for an inner future.
std::string outcomeOf(Future<void>& future) {
    try {
        future.get();
        return "value";
    } catch (const std::exception& caught) {
        return caught.what();
    }
}

struct UnwrapCase {
    Ending ending;
    const char* outcome;
};

class UnwrapInner : public testing::TestWithParam<UnwrapCase> {
protected:
    void endInner() {
        switch (GetParam().ending) {
            case Ending::value:
                inner_.setValue();
                break;
            case Ending::exception:
                inner_.setException(failure("inner"));
                break;
            case Ending::cancelled:
                inner_ = Promise<void>();
                break;
            case Ending::invalid:
                break;
        }
    }

    Future<void> innerFuture() {
        return GetParam().ending == Ending::invalid ? Future<void>() : inner_.getFuture();
    }

    Promise<Future<void>> outer_;
    Promise<void> inner_;
};

TEST_P(UnwrapInner, PassesTheOutcomeOnWhenAllIsResolvedBefore) {
    outer_.setValue(innerFuture());
    endInner();
    Future<void> result = unwrap(outer_.getFuture());
    EXPECT_EQ(outcomeOf(result), GetParam().outcome);
}

TEST_P(UnwrapInner, PassesTheOutcomeOnWhenTheInnerResolvesFirst) {
    Future<void> result = unwrap(outer_.getFuture());
    Future<void> inner = innerFuture();
    endInner();
    outer_.setValue(std::move(inner));
    EXPECT_EQ(outcomeOf(result), GetParam().outcome);
}

TEST_P(UnwrapInner, PassesTheOutcomeOnWhenTheOuterResolvesFirst) {
    Future<void> result = unwrap(outer_.getFuture());
    outer_.setValue(innerFuture());
    endInner();
    EXPECT_EQ(outcomeOf(result), GetParam().outcome);
}

TEST_P(UnwrapInner, PassesTheOutcomeOnBetweenThreads) {
    Future<void> result = unwrap(outer_.getFuture());
    Future<void> inner = innerFuture();
    std::thread outerResolver([&] { outer_.setValue(std::move(inner)); });
    std::thread innerResolver([&] { endInner(); });
    EXPECT_EQ(outcomeOf(result), GetParam().outcome);
    outerResolver.join();
    innerResolver.join();
}

INSTANTIATE_TEST_SUITE_P(Outcomes, UnwrapInner,
                         testing::Values(UnwrapCase{Ending::value, "value"},
                                         UnwrapCase{Ending::exception, "inner"},
                                         UnwrapCase{Ending::cancelled, cancelledText},
                                         UnwrapCase{Ending::invalid, invalidText}));

TEST(Unwrap, IsPendingUntilTheInnerFutureResolves) {
    Promise<Future<void>> outer;
    Promise<void> inner;
    bool ended = false;
    unwrap(outer.getFuture()).then([&](Future<void>) { ended = true; });
    outer.setValue(inner.getFuture());
    EXPECT_FALSE(ended);
    inner.setValue();
    EXPECT_TRUE(ended);
}

TEST(Unwrap, PassesTheExceptionOfTheOuterFutureOn) {
    Promise<Future<void>> outer;
    Future<void> result = unwrap(outer.getFuture());
    outer.setException(failure("outer"));
    EXPECT_THAT(Call([&] { result.get(); }), rethrows("outer"));
}

TEST(Unwrap, IsCancelledWithTheOuterFuture) {
    auto outer = std::make_unique<Promise<Future<void>>>();
    Future<void> result = unwrap(outer->getFuture());
    outer.reset();
    EXPECT_THAT(Call([&] { result.get(); }), failsWith(cancelledText));
}

TEST(Unwrap, RefusesAnInvalidOuterFuture) {
    EXPECT_THAT(Call([] { unwrap(Future<Future<void>>()); }), failsWith(invalidText));
}

TEST(Unwrap, PassesOnThatTheInnerOutcomeWasTaken) {
    const auto inner = std::make_shared<detail::SharedFutureState<void>>();
    inner->setValue();
    Future<void>(inner).get();
    Promise<Future<void>> outer;
    Future<void> result = unwrap(outer.getFuture());
    outer.setValue(Future<void>(inner));
    EXPECT_THAT(Call([&] { result.get(); }), failsWith(thenTakenText));
}

}  // namespace
}  // namespace futures
