// SPDX-License-Identifier: Apache-2.0
// The state that a promise and its future share, and the interface of the continuation attached to
// it.
#pragma once

#include <condition_variable>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <type_traits>
#include <utility>
#include <variant>

namespace futures::detail {

template <typename T>
class SharedFutureState;

/// A callback of unknown type, waiting for a `SharedFutureState<T>` to resolve.
template <typename T>
class ContinuationBase {
public:
    ContinuationBase() = default;
    ContinuationBase(const ContinuationBase&) = delete;
    ContinuationBase& operator=(const ContinuationBase&) = delete;
    virtual ~ContinuationBase() = default;

    /// Calls the callback. `state` is resolved with a value or an exception.
    virtual void run(std::shared_ptr<SharedFutureState<T>> state) = 0;
};

enum class FutureStatus : std::uint32_t { pending = 0, value = 1, exception = 2, cancelled = 3 };

/// What a result of type T is stored as; a void result has no value, only a status.
template <typename T>
using StoredValue = std::conditional_t<std::is_void_v<T>, std::monostate, T>;

/// The outcome of one asynchronous operation, pending at first and resolved once. It is created
/// with std::make_shared and lives as long as a future, a promise or a running continuation holds
/// it.
///
/// No callback is called, and no continuation made or destroyed, while the mutex is held, so these
/// may use any future, this one included.
template <typename T>
class SharedFutureState : public std::enable_shared_from_this<SharedFutureState<T>> {
public:
    /// Either alternative of an outcome, in its heap cell.
    using Outcome = std::variant<StoredValue<T>, std::exception_ptr>;

    /// Resolves with `value`. Does nothing when cancelled; throws std::runtime_error "Promise
    /// already resolved." when there is an outcome.
    void setValue(StoredValue<T> value) requires(!std::is_void_v<T>) {
        settle(FutureStatus::value,
               std::make_unique<Outcome>(std::in_place_index<0>, std::move(value)));
    }

    void setValue() requires(std::is_void_v<T>) { settle(FutureStatus::value, nullptr); }

    /// Resolves with `exception`, which is not null; otherwise as setValue.
    void setException(std::exception_ptr exception) {
        settle(FutureStatus::exception,
               std::make_unique<Outcome>(std::in_place_index<1>, std::move(exception)));
    }

    /// Cancels the state when it is pending: waiters wake, a continuation is destroyed without
    /// being run, and a later outcome is dropped.
    void cancel() {
        std::unique_lock lock(mutex);
        if (status != FutureStatus::pending) {
            return;
        }
        status = FutureStatus::cancelled;
        resolve(std::move(lock));
    }

    /// Records that the future has been handed out. Throws std::runtime_error when it had been.
    void markFutureRetrieved() {
        const std::lock_guard lock(mutex);
        if (futureRetrieved) {
            throw std::runtime_error("Promise already returned a future.");
        }
        futureRetrieved = true;
    }

    /// Waits for the outcome and takes it out: returns the value, or rethrows the exception. Throws
    /// std::runtime_error when the state is or gets cancelled, and when the outcome is not
    /// available because it was taken or a continuation waits for it.
    T takeOutcome() {
        std::unique_lock lock(mutex);
        if (valueReturned || continuation) {
            throw std::runtime_error(
                "Future already returned it's value or has an associated continuation.");
        }
        valueReturned = true;
        ready.wait(lock, [this] { return status != FutureStatus::pending; });
        switch (status) {
            case FutureStatus::value:
            case FutureStatus::exception:
                break;
            case FutureStatus::cancelled:
                throw std::runtime_error("Future has been cancelled.");
            default:
                throw std::runtime_error("Invalid Future state reached.");
        }
        // The caller keeps the cell, so that the value is moved, and an exception released, without
        // the lock.
        const bool holdsException = status == FutureStatus::exception;
        const std::unique_ptr<Outcome> outcome = std::move(result);
        lock.unlock();
        if (holdsException) {
            std::rethrow_exception(std::move(std::get<1>(*outcome)));
        }
        if constexpr (!std::is_void_v<T>) {
            return std::move(std::get<0>(*outcome));
        }
    }

    /// Attaches the continuation that `make` returns, and runs it at once when there is an outcome.
    /// Throws std::runtime_error, without calling `make`, when the outcome was taken or a
    /// continuation is attached already.
    template <typename MakeContinuation>
    void attach(MakeContinuation&& make) {
        // The outcome is reserved first, so that nobody else takes it meanwhile.
        reserveOutcome();
        std::unique_ptr<ContinuationBase<T>> made;
        try {
            made = std::forward<MakeContinuation>(make)();
        } catch (...) {
            const std::lock_guard lock(mutex);
            valueReturned = false;
            throw;
        }
        std::unique_lock lock(mutex);
        continuation = std::move(made);
        if (status != FutureStatus::pending) {
            resolve(std::move(lock));
        }
    }

    // The weak reference to itself is the base class's. The mutex guards everything below it.
    std::mutex mutex;
    std::condition_variable ready;  // notified whenever the state is resolved
    std::unique_ptr<Outcome> result;
    std::unique_ptr<ContinuationBase<T>> continuation;
    FutureStatus status = FutureStatus::pending;
    bool futureRetrieved = false;
    bool valueReturned = false;  // the outcome was taken, or is a continuation's to take

private:
    void reserveOutcome() {
        const std::lock_guard lock(mutex);
        if (valueReturned || continuation) {
            throw std::runtime_error(
                "Future already has returned it's value or has an associated continuation.");
        }
        valueReturned = true;
    }

    void settle(FutureStatus outcomeStatus, std::unique_ptr<Outcome> outcome) {
        std::unique_lock lock(mutex);
        if (status == FutureStatus::cancelled) {
            return;
        }
        if (status != FutureStatus::pending) {
            lock.unlock();
            throw std::runtime_error("Promise already resolved.");
        }
        status = outcomeStatus;
        result = std::move(outcome);
        resolve(std::move(lock));
    }

    // Passes a status that is no longer pending on to those that wait for it.
    void resolve(std::unique_lock<std::mutex> lock) {
        std::unique_ptr<ContinuationBase<T>> detached = std::move(continuation);
        if (detached && (status == FutureStatus::value || status == FutureStatus::exception)) {
            // Cleared together with the detaching, so that the continuation's future can be read.
            futureRetrieved = false;
            valueReturned = false;
            lock.unlock();
            detached->run(this->shared_from_this());
        } else {
            lock.unlock();
        }
        detached.reset();
        ready.notify_all();
    }
};

}  // namespace futures::detail
