// SPDX-License-Identifier: Apache-2.0
// A callback that can be revoked while other threads call it.
#pragma once

#include <algorithm>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

namespace platform::messaging {

/// A function that any number of threads may call until it is revoked.
template <typename... Args>
class RevocableFunction {
public:
    explicit RevocableFunction(std::function<void(Args...)> function)
        : function_(std::move(function)) {}

    RevocableFunction(const RevocableFunction&) = delete;
    RevocableFunction& operator=(const RevocableFunction&) = delete;
    ~RevocableFunction() = default;

    /// Calls the function, unless it has been revoked. Its exceptions pass through.
    void operator()(Args... args) {
        if (!enter()) {
            return;
        }
        const Call call{*this};
        function_(std::forward<Args>(args)...);
    }

    /// Revokes the function, once. Waits for the calls on other threads; when it returns, the
    /// function is not running and has been destroyed. When the function itself revokes it, the
    /// calls on this thread go on, and the function is destroyed as the last of them ends.
    void revoke() {
        std::function<void(Args...)> ended;  // destroyed without the mutex
        std::unique_lock lock(mutex_);
        const auto ownCalls = static_cast<std::size_t>(
            std::count(callers_.begin(), callers_.end(), std::this_thread::get_id()));
        revoked_ = true;
        revokedFromInside_ = ownCalls != 0;
        left_.wait(lock, [&] { return callers_.size() == ownCalls; });
        if (!revokedFromInside_) {
            ended.swap(function_);
        }
    }

private:
    struct Call {
        RevocableFunction& function;
        ~Call() { function.leave(); }
    };

    bool enter() {
        const std::lock_guard lock(mutex_);
        if (revoked_) {
            return false;
        }
        callers_.push_back(std::this_thread::get_id());
        return true;
    }

    void leave() {
        std::function<void(Args...)> ended;  // destroyed without the mutex
        const std::lock_guard lock(mutex_);
        callers_.erase(std::find(callers_.begin(), callers_.end(), std::this_thread::get_id()));
        if (revokedFromInside_ && callers_.empty()) {
            ended.swap(function_);
        }
        left_.notify_all();
    }

    std::function<void(Args...)> function_;  // called without the mutex

    std::mutex mutex_;  // guards what follows
    std::condition_variable left_;
    std::vector<std::thread::id> callers_;  // one entry for each call that is running
    bool revoked_ = false;
    bool revokedFromInside_ = false;
};

}  // namespace platform::messaging
