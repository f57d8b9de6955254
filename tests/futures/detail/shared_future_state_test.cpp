// SPDX-License-Identifier: Apache-2.0
// The shared state: its fields, its locking, and its rules against a model of them.

#include "futures/detail/shared_future_state.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "futures/future.h"

namespace futures::detail {
namespace {

using testing::StrEq;
using testing::ThrowsMessage;

auto failsWith(const char* text) {
    return ThrowsMessage<std::runtime_error>(StrEq(text));
}

template <typename T>
std::ptrdiff_t offsetIn(const SharedFutureState<T>& state, const void* field) {
    return static_cast<const char*>(field) -
           static_cast<const char*>(static_cast<const void*>(&state));
}

TEST(SharedFutureState, KeepsItsFieldsInOrder) {
    const auto state = std::make_shared<SharedFutureState<std::string>>();
    const std::weak_ptr<SharedFutureState<std::string>> self = state->weak_from_this();
    const std::vector<std::ptrdiff_t> offsets = {
        offsetIn(*state, &state->mutex),        offsetIn(*state, &state->ready),
        offsetIn(*state, &state->result),       offsetIn(*state, &state->continuation),
        offsetIn(*state, &state->status),       offsetIn(*state, &state->futureRetrieved),
        offsetIn(*state, &state->valueReturned)};
    EXPECT_EQ(self.lock(), state);
    EXPECT_EQ(offsets.front(), static_cast<std::ptrdiff_t>(sizeof(self)));
    for (std::size_t field = 1; field < offsets.size(); ++field) {
        EXPECT_LT(offsets[field - 1], offsets[field]) << field;
    }
}

TEST(SharedFutureState, NumbersItsStatus) {
    static_assert(sizeof(FutureStatus) == 4);
    SharedFutureState<int> pending;
    EXPECT_EQ(static_cast<unsigned>(pending.status), 0u);
    SharedFutureState<int> value;
    value.setValue(1);
    EXPECT_EQ(static_cast<unsigned>(value.status), 1u);
    SharedFutureState<int> exception;
    exception.setException(std::make_exception_ptr(1));
    EXPECT_EQ(static_cast<unsigned>(exception.status), 2u);
    SharedFutureState<int> cancelled;
    cancelled.cancel();
    EXPECT_EQ(static_cast<unsigned>(cancelled.status), 3u);
}

TEST(SharedFutureState, KeepsAnOutcomeInAHeapCell) {
    SharedFutureState<int> value;
    EXPECT_EQ(value.result, nullptr);
    value.setValue(17);
    ASSERT_NE(value.result, nullptr);
    EXPECT_EQ(std::get<0>(*value.result), 17);

    SharedFutureState<void> nothing;
    nothing.setValue();
    EXPECT_EQ(nothing.result, nullptr);

    SharedFutureState<void> exception;
    exception.setException(std::make_exception_ptr(18));
    ASSERT_NE(exception.result, nullptr);
    EXPECT_THROW(std::rethrow_exception(std::get<1>(*exception.result)), int);
}

TEST(SharedFutureState, ReportsAStatusThatIsNone) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    state->status = static_cast<FutureStatus>(4);
    EXPECT_THAT([&] { state->takeOutcome(); }, failsWith("Invalid Future state reached."));
}

// A continuation that calls `onRun`, and `onEnd` when it is destroyed.
class Probe final : public ContinuationBase<int> {
public:
    using State = std::shared_ptr<SharedFutureState<int>>;

    Probe(std::function<void(const State&)> onRun, std::function<void()> onEnd)
        : onRun_(std::move(onRun)), onEnd_(std::move(onEnd)) {}
    ~Probe() override { onEnd_(); }
    void run(State state) override { onRun_(state); }

private:
    std::function<void(const State&)> onRun_;
    std::function<void()> onEnd_;
};

bool isUnlocked(std::mutex& mutex) {
    const std::unique_lock lock(mutex, std::try_to_lock);
    return lock.owns_lock();
}

TEST(SharedFutureState, RunsItsContinuationUnlockedDetachedAndWithClearFlags) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    int runs = 0;
    int ends = 0;
    state->futureRetrieved = true;
    state->attach([&] {
        return std::make_unique<Probe>(
            [&](const Probe::State& given) {
                ++runs;
                EXPECT_EQ(given, state);
                EXPECT_TRUE(isUnlocked(state->mutex));
                EXPECT_EQ(state->continuation, nullptr);
                EXPECT_FALSE(state->futureRetrieved);
                EXPECT_FALSE(state->valueReturned);
                EXPECT_EQ(ends, 0);
            },
            [&] {
                ++ends;
                EXPECT_TRUE(isUnlocked(state->mutex));
                EXPECT_EQ(state.use_count(), 1) << "the strong reference goes first";
            });
    });
    EXPECT_TRUE(state->futureRetrieved);
    EXPECT_TRUE(state->valueReturned);
    EXPECT_NE(state->continuation, nullptr);
    state->setValue(1);
    EXPECT_EQ(runs, 1);
    EXPECT_EQ(ends, 1);
}

TEST(SharedFutureState, HasItsContinuationMadeUnlockedWhileNobodyElseCanTakeTheOutcome) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    int runs = 0;
    state->attach([&] {
        EXPECT_TRUE(isUnlocked(state->mutex));
        EXPECT_THAT([&] { state->takeOutcome(); },
                    failsWith("Future already returned it's value or has an associated "
                              "continuation."));
        EXPECT_THAT([&] { state->attach([] { return nullptr; }); },
                    failsWith("Future already has returned it's value or has an associated "
                              "continuation."));
        return std::make_unique<Probe>([&](const Probe::State&) { ++runs; }, [] {});
    });
    EXPECT_EQ(runs, 0);
    state->setValue(1);
    EXPECT_EQ(runs, 1);
}

TEST(SharedFutureState, RunsAtOnceAContinuationDuringWhoseMakingItWasResolved) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    int runs = 0;
    state->attach([&] {
        state->setValue(1);
        return std::make_unique<Probe>([&](const Probe::State&) { ++runs; }, [] {});
    });
    EXPECT_EQ(runs, 1);
    EXPECT_EQ(state->continuation, nullptr);
    EXPECT_EQ(state->takeOutcome(), 1);
}

TEST(SharedFutureState, LeavesItsFlagsAloneWithoutContinuation) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    state->markFutureRetrieved();
    state->setValue(1);
    EXPECT_TRUE(state->futureRetrieved);
    EXPECT_THAT([&] { state->markFutureRetrieved(); },
                failsWith("Promise already returned a future."));
}

TEST(SharedFutureState, DestroysACancelledContinuationUnlockedAndUnrun) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    int ends = 0;
    state->attach([&] {
        return std::make_unique<Probe>([](const Probe::State&) { FAIL() << "was run"; },
                                       [&] {
                                           ++ends;
                                           EXPECT_TRUE(isUnlocked(state->mutex));
                                       });
    });
    state->cancel();
    EXPECT_EQ(ends, 1);
    EXPECT_EQ(state->continuation, nullptr);
}

TEST(SharedFutureState, IsUnlockedAfterEveryRefusal) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    state->setValue(1);
    state->takeOutcome();
    EXPECT_THROW(state->setValue(2), std::runtime_error);
    EXPECT_TRUE(isUnlocked(state->mutex));
    EXPECT_THROW(state->takeOutcome(), std::runtime_error);
    EXPECT_TRUE(isUnlocked(state->mutex));
    EXPECT_THROW(state->attach([] { return nullptr; }), std::runtime_error);
    EXPECT_TRUE(isUnlocked(state->mutex));
}

TEST(SharedFutureState, IsUnchangedByAContinuationThatCannotBeMade) {
    const auto state = std::make_shared<SharedFutureState<int>>();
    EXPECT_THROW(
        state->attach([]() -> std::unique_ptr<ContinuationBase<int>> { throw std::bad_alloc(); }),
        std::bad_alloc);
    EXPECT_TRUE(isUnlocked(state->mutex));
    EXPECT_FALSE(state->valueReturned);
    state->setValue(3);
    EXPECT_EQ(state->takeOutcome(), 3);
}

TEST(SharedFutureState, CannotHandItselfToAContinuationWithoutAnOwner) {
    SharedFutureState<int> unowned;
    int ends = 0;
    unowned.attach([&] {
        return std::make_unique<Probe>([](const Probe::State&) { FAIL() << "was run"; },
                                       [&] { ++ends; });
    });
    EXPECT_THROW(unowned.setValue(1), std::bad_weak_ptr);
    EXPECT_EQ(ends, 1);
    EXPECT_TRUE(isUnlocked(unowned.mutex));
}

TEST(SharedFutureState, DestroysAValueThatNobodyTakes) {
    auto value = std::make_shared<int>(1);
    const std::weak_ptr<int> alive = value;
    {
        SharedFutureState<std::shared_ptr<int>> state;
        state.setValue(std::move(value));
        EXPECT_FALSE(alive.expired());
    }
    EXPECT_TRUE(alive.expired());
}

// A model of a state's rules, without threads or memory.
struct Model {
    unsigned status = 0;
    int value = 0;
    bool retrieved = false;
    bool returned = false;
    bool attached = false;

    std::string set(unsigned outcome, int number) {
        if (status == 3) {
            return "";
        }
        if (status != 0) {
            return "Promise already resolved.";
        }
        status = outcome;
        value = number;
        return resolve();
    }

    std::string cancel() {
        if (status == 0) {
            status = 3;
            return resolve();
        }
        return "";
    }

    std::string retrieve() {
        if (retrieved) {
            return "Promise already returned a future.";
        }
        retrieved = true;
        return "";
    }

    std::string get() {
        if (returned || attached) {
            return "Future already returned it's value or has an associated continuation.";
        }
        returned = true;
        return status == 3 ? "Future has been cancelled." : outcome();
    }

    std::string then() {
        if (returned || attached) {
            return "Future already has returned it's value or has an associated continuation.";
        }
        attached = true;
        returned = true;
        return status != 0 ? resolve() : "";
    }

private:
    std::string outcome() const {
        return (status == 1 ? "value " : "exception ") + std::to_string(value);
    }

    // Says what the continuation does, which takes the outcome when it is run.
    std::string resolve() {
        if (!attached) {
            return "";
        }
        attached = false;
        if (status == 3) {
            return "dropped";
        }
        retrieved = false;
        returned = true;
        return "ran with " + outcome();
    }
};

std::string describe(const std::function<std::string()>& operation) {
    try {
        return operation();
    } catch (const std::exception& caught) {
        return caught.what();
    }
}

// A state that is driven by the same numbers as the model.
class Subject {
public:
    std::string set(unsigned outcome, int number) {
        return describe([&] {
            said_.clear();
            if (outcome == 1) {
                state_->setValue(number);
            } else {
                state_->setException(std::make_exception_ptr(
                    std::runtime_error("exception " + std::to_string(number))));
            }
            return said_;
        });
    }

    std::string cancel() {
        said_.clear();
        state_->cancel();
        return said_;
    }

    std::string retrieve() {
        return describe([&] {
            state_->markFutureRetrieved();
            return std::string();
        });
    }

    std::string get() {
        return describe([&] { return "value " + std::to_string(state_->takeOutcome()); });
    }

    std::string then() {
        return describe([&] {
            said_.clear();
            const auto onDrop = [this](const int*) { said_ = said_.empty() ? "dropped" : said_; };
            Future<int>(state_).then(
                [this, drop = std::shared_ptr<const int>(nullptr, onDrop)](Future<int> future) {
                    said_ = "ran with " +
                            describe([&] { return "value " + std::to_string(future.get()); });
                });
            return said_;
        });
    }

    const SharedFutureState<int>& state() const { return *state_; }

private:
    std::string said_;
    std::shared_ptr<SharedFutureState<int>> state_ = std::make_shared<SharedFutureState<int>>();
};

TEST(SharedFutureState, FollowsItsRulesInEveryOrderOfOperations) {
    std::mt19937 random(20240607);
    for (int round = 0; round < 20000; ++round) {
        Model model;
        Subject subject;
        std::string history;
        for (int step = 0; step < 8; ++step) {
            const auto operation = static_cast<unsigned>(random() % 6);
            std::string expected;
            std::string actual;
            switch (operation) {
                case 0:
                case 1:
                    expected = model.set(operation + 1, step);
                    actual = subject.set(operation + 1, step);
                    break;
                case 2:
                    expected = model.cancel();
                    actual = subject.cancel();
                    break;
                case 3:
                    expected = model.retrieve();
                    actual = subject.retrieve();
                    break;
                case 4:
                    if (model.status == 0 && !model.returned && !model.attached) {
                        continue;  // would wait
                    }
                    expected = model.get();
                    actual = subject.get();
                    break;
                default:
                    expected = model.then();
                    actual = subject.then();
                    break;
            }
            history += std::to_string(operation) + ' ';
            ASSERT_EQ(actual, expected) << history;
            ASSERT_EQ(static_cast<unsigned>(subject.state().status), model.status) << history;
            ASSERT_EQ(subject.state().futureRetrieved, model.retrieved) << history;
            ASSERT_EQ(subject.state().valueReturned, model.returned) << history;
            ASSERT_EQ(subject.state().continuation != nullptr, model.attached) << history;
        }
    }
}

}  // namespace
}  // namespace futures::detail
