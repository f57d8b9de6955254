// SPDX-License-Identifier: Apache-2.0
// One-shot asynchronous results: a Promise is resolved once, its Future is read once, by waiting
// for the outcome (get) or by a continuation that is called with it (then).
#pragma once

#include <exception>
#include <functional>
#include <memory>
#include <stdexcept>
#include <type_traits>
#include <utility>

#include "futures/detail/shared_future_state.h"

namespace futures {

template <typename T>
class Future;

namespace detail {

/// What a callback of type F returns when it is called with a Future<T>, as a value.
template <typename F, typename T>
using ContinuationResult = std::decay_t<std::invoke_result_t<std::decay_t<F>, Future<T>>>;

}  // namespace detail

/// The producer's end. Move-only. A promise that goes away before it is resolved cancels its state,
/// so that nobody waits for an outcome that cannot come.
template <typename T>
class Promise {
public:
    /// Makes a fresh pending state.
    Promise() : state_(std::make_shared<detail::SharedFutureState<T>>()) {}

    Promise(Promise&& other) noexcept = default;

    Promise& operator=(Promise&& other) noexcept {
        Promise(std::move(other)).state_.swap(state_);
        return *this;
    }

    Promise(const Promise&) = delete;
    Promise& operator=(const Promise&) = delete;

    ~Promise() {
        if (state_) {
            state_->cancel();
        }
    }

    /// The future of this promise, once. Throws std::runtime_error "Promise already returned a
    /// future." after that.
    Future<T> getFuture() {
        const auto state = sharedState();
        state->markFutureRetrieved();
        return Future<T>(state);
    }

    /// Resolves the state with `value`; a continuation that is attached runs before this returns.
    /// Does nothing when the state was cancelled. Throws std::runtime_error "Promise already
    /// resolved." when it has an outcome.
    void setValue(detail::StoredValue<T> value) requires(!std::is_void_v<T>) {
        sharedState()->setValue(std::move(value));
    }

    void setValue() requires(std::is_void_v<T>) { sharedState()->setValue(); }

    /// Resolves the state with `exception`, which is not null; otherwise as setValue.
    void setException(std::exception_ptr exception) {
        sharedState()->setException(std::move(exception));
    }

private:
    // A strong reference, since a continuation may destroy this promise while the state resolves.
    std::shared_ptr<detail::SharedFutureState<T>> sharedState() const {
        if (!state_) {
            throw std::runtime_error("Promise state isn't valid!");
        }
        return state_;
    }

    std::shared_ptr<detail::SharedFutureState<T>> state_;
};

/// The consumer's end. Move-only; one thread at a time uses a Future object. `get` and `then` each
/// consume it, whether they succeed or throw: afterwards it is invalid.
template <typename T>
class Future {
public:
    /// An invalid future.
    Future() noexcept = default;

    /// Another future on `state`.
    explicit Future(std::shared_ptr<detail::SharedFutureState<T>> state) noexcept
        : state_(std::move(state)) {}

    Future(Future&&) noexcept = default;
    Future& operator=(Future&&) noexcept = default;
    Future(const Future&) = delete;
    Future& operator=(const Future&) = delete;
    ~Future() = default;

    /// Whether the future holds a state, resolved or not.
    bool valid() const noexcept { return state_ != nullptr; }

    /// Blocks until the state is resolved, then returns its value or rethrows its exception. Throws
    /// std::runtime_error "Future has been cancelled." when there will be none, and other texts
    /// when the future is invalid or its outcome already taken.
    T get() { return takeState()->takeOutcome(); }

    /// Calls `callback` with the resolved future, which it can `get` without blocking: on the
    /// thread that resolves the promise, or at once on this one if it is already resolved.
    /// Returns the future of the callback's result, or of the exception that it throws. When the
    /// state is cancelled instead, the callback is destroyed without being called and the returned
    /// future is cancelled too. Throws std::runtime_error when the future is invalid or its outcome
    /// already taken.
    template <typename F>
    Future<detail::ContinuationResult<F, T>> then(F&& callback);

    /// Gives up on the outcome: when the state is still pending, those that wait for it learn that
    /// it has been cancelled, and an outcome set later is dropped. The future stays valid.
    void cancel() {
        if (!state_) {
            throw std::runtime_error(invalidText);
        }
        state_->cancel();
    }

private:
    static constexpr const char* invalidText = "Future state isn't valid!";

    std::shared_ptr<detail::SharedFutureState<T>> takeState() {
        if (!state_) {
            throw std::runtime_error(invalidText);
        }
        return std::exchange(state_, nullptr);
    }

    std::shared_ptr<detail::SharedFutureState<T>> state_;
};

namespace detail {

/// Calls `function` and returns the exception that it throws, or null. The exception can then be
/// handled outside of a catch block, which would keep it alive.
template <typename F>
std::exception_ptr exceptionOf(F&& function) {
    try {
        std::forward<F>(function)();
        return nullptr;
    } catch (...) {
        return std::current_exception();
    }
}

/// Calls a callback of type F, once, with the future of a `SharedFutureState<T>` and delivers its
/// result of type R. Destroyed without having been run, it cancels the state of that result.
template <typename T, typename F, typename R = ContinuationResult<F, T>>
class Continuation final : public ContinuationBase<T> {
public:
    template <typename Callback>
    Continuation(Promise<R> result, Callback&& callback)
        : result_(std::move(result)), callback_(std::forward<Callback>(callback)) {}

    // An exception from the callback's destructor cannot be delivered and ends the process. Written
    // out, since g++ 12 lets it out of a defaulted destructor.
    ~Continuation() noexcept override {}

    void run(std::shared_ptr<SharedFutureState<T>> state) override {
        Future<T> future(std::move(state));
        std::exception_ptr failure = exceptionOf([&] {
            if constexpr (std::is_void_v<R>) {
                std::invoke(std::move(callback_), std::move(future));
                result_.setValue();
            } else {
                result_.setValue(std::invoke(std::move(callback_), std::move(future)));
            }
        });
        if (failure) {
            result_.setException(std::move(failure));
        }
    }

private:
    // In this order: nobody learns of a cancelled result before the callback is gone.
    Promise<R> result_;
    F callback_;
};

}  // namespace detail

template <typename T>
template <typename F>
Future<detail::ContinuationResult<F, T>> Future<T>::then(F&& callback) {
    using Result = detail::ContinuationResult<F, T>;
    using Continuation = detail::Continuation<T, std::decay_t<F>>;

    Future<Result> future;
    takeState()->attach([&] {
        Promise<Result> result;
        future = result.getFuture();
        return std::make_unique<Continuation>(std::move(result), std::forward<F>(callback));
    });
    return future;
}

/// A future that resolves when the inner future of `outer` does, with its outcome. It also holds
/// the exception when the outer future has one or the inner one is invalid, and is cancelled when
/// either is.
inline Future<void> unwrap(Future<Future<void>>&& outer) {
    const auto promise = std::make_shared<Promise<void>>();
    Future<void> result = promise->getFuture();
    const auto passOn = [promise](Future<void> inner) {
        if (auto failure = detail::exceptionOf([&] { inner.get(); })) {
            promise->setException(std::move(failure));
        } else {
            promise->setValue();
        }
    };
    outer.then([promise, passOn](Future<Future<void>> resolved) {
        if (auto failure = detail::exceptionOf([&] { resolved.get().then(passOn); })) {
            promise->setException(std::move(failure));
        }
    });
    return result;
}

}  // namespace futures
