// SPDX-License-Identifier: Apache-2.0
#include "host/commands/progress.h"

#include <pthread.h>
#include <signal.h>
#include <unistd.h>

#include <iostream>
#include <utility>

namespace host {

namespace {

constexpr std::chrono::seconds patience{1};
constexpr std::chrono::milliseconds interval{250};
// The cursor stays at the line's beginning, so that the next output overwrites the line.
constexpr const char* eraseLine = "\r\x1B[K";

}  // namespace

Progress::Progress(std::string work) : work_(std::move(work)) {
    if (::isatty(STDERR_FILENO) == 1) {
        // This thread inherits the signal mask, so signals go to the threads that handle them.
        sigset_t all;
        sigset_t before;
        ::sigfillset(&all);
        ::pthread_sigmask(SIG_SETMASK, &all, &before);
        thread_ = std::thread([this] { show(); });
        ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
    }
}

Progress::~Progress() {
    if (thread_.joinable()) {
        {
            const std::lock_guard lock(mutex_);
            hasEnded_ = true;
        }
        changed_.notify_one();
        thread_.join();
        clear();
    }
}

void Progress::tell(std::string work) {
    const std::lock_guard lock(mutex_);
    work_ = std::move(work);
}

void Progress::clear() {
    const std::lock_guard lock(mutex_);
    if (std::exchange(isShown_, false)) {
        std::cerr << eraseLine << std::flush;
    }
}

void Progress::show() {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, patience, [this] { return hasEnded_; });
    while (!hasEnded_) {
        const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(
            std::chrono::steady_clock::now() - start_);
        std::cerr << eraseLine << work_ << ", " << seconds.count() << " s\r" << std::flush;
        isShown_ = true;
        changed_.wait_for(lock, interval, [this] { return hasEnded_; });
    }
}

}  // namespace host
