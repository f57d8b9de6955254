// SPDX-License-Identifier: Apache-2.0
#include "host/guard/save_locks.h"

#include <fcntl.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <stdexcept>
#include <system_error>
#include <thread>
#include <utility>

#include "host/guard/document_version.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

constexpr std::chrono::milliseconds pause{2};
constexpr std::chrono::milliseconds stuckWait{100};  // longer than most saves take

int setLock(int file, short type, std::size_t number) {
    struct flock lock {};
    lock.l_type = type;
    lock.l_whence = SEEK_SET;
    lock.l_start = static_cast<off_t>(number);
    lock.l_len = 1;
    return ::fcntl(file, F_OFD_SETLK, &lock);
}

// Returns whether the lock could be had in that time. It is tried again and again: there is no
// other way to wait for a lock with a time limit.
bool waitFor(int file, std::size_t number, std::chrono::milliseconds longest) {
    const auto end = std::chrono::steady_clock::now() + longest;
    while (setLock(file, F_WRLCK, number) != 0) {
        const bool isHeld = errno == EAGAIN || errno == EACCES || errno == EINTR;
        if (!isHeld) {
            platform::throwSystemError("cannot be locked");
        }
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(pause);
    }
    return true;
}

}  // namespace

SaveLocks::SaveLocks(const std::filesystem::path& file, std::chrono::milliseconds longestWait)
    : longestWait_(longestWait) {
    if (!file.empty()) {
        file_ = platform::FileDescriptor(::open(file.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
    }
    if (!file.empty() && !file_) {
        spdlog::warn("saves are not kept apart from those of other workers: {}: {}", file.string(),
                     std::generic_category().message(errno));
    }
}

SaveLocks::Held::Held(int file, std::size_t number, std::unique_lock<std::mutex> lock)
    : file_(file), number_(number), lock_(std::move(lock)) {}

SaveLocks::Held::~Held() {
    if (lock_ && file_ >= 0) {
        setLock(file_, F_UNLCK, number_);
    }
}

SaveLocks::Held SaveLocks::hold(const std::string& path) {
    const std::size_t number = std::stoul(digestOf(path).substr(0, 8), nullptr, 16) % count;
    Lock& lock = locks_.at(number);
    std::unique_lock held(lock.mutex);
    if (file_) {
        const auto longest = lock.isStuck ? std::min(longestWait_, stuckWait) : longestWait_;
        lock.isStuck = !waitFor(file_.get(), number, longest);
        if (lock.isStuck) {
            throw std::runtime_error("is locked by the save of another worker");
        }
    }
    return {file_.get(), number, std::move(held)};
}

}  // namespace host
