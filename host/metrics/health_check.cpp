// SPDX-License-Identifier: Apache-2.0
#include "host/metrics/health_check.h"

#include <algorithm>
#include <condition_variable>
#include <mutex>
#include <optional>
#include <system_error>
#include <thread>
#include <utility>

namespace host {

namespace {

using Clock = std::chrono::steady_clock;

}  // namespace

bool areReadable(const std::vector<std::filesystem::path>& folders) {
    return std::all_of(folders.begin(), folders.end(), [](const std::filesystem::path& folder) {
        std::error_code error;
        const std::filesystem::directory_iterator entries(folder, error);
        return !error;
    });
}

// Belongs to the thread as well, which may outlive the object.
struct HealthCheck::State {
    std::mutex mutex;
    std::condition_variable stopped;
    bool isStopping = false;                       // guarded by mutex
    std::optional<Clock::time_point> lastHealthy;  // guarded by mutex; none: it is not
    std::chrono::milliseconds interval;
};

HealthCheck::HealthCheck(std::function<bool()> look, std::chrono::milliseconds interval)
    : state_(std::make_shared<State>()) {
    state_->interval = interval;
    std::thread([state = state_, look = std::move(look)] {
        std::unique_lock lock(state->mutex);
        while (!state->isStopping) {
            lock.unlock();
            const bool isHealthy = look();
            lock.lock();
            state->lastHealthy = isHealthy ? std::optional(Clock::now()) : std::nullopt;
            state->stopped.wait_for(lock, state->interval, [&] { return state->isStopping; });
        }
    }).detach();
}

HealthCheck::~HealthCheck() {
    const std::lock_guard lock(state_->mutex);
    state_->isStopping = true;
    state_->stopped.notify_all();
}

bool HealthCheck::isHealthy() const {
    const std::lock_guard lock(state_->mutex);
    return state_->lastHealthy && Clock::now() - *state_->lastHealthy < 3 * state_->interval;
}

}  // namespace host
