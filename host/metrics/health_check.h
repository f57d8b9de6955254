// SPDX-License-Identifier: Apache-2.0
// Whether the folders that a host serves can be read, even when finding out never ends.
#pragma once

#include <chrono>
#include <filesystem>
#include <functional>
#include <memory>
#include <vector>

namespace host {

/// Whether all of `folders` can be read.
bool areReadable(const std::vector<std::filesystem::path>& folders);

/// Checks again and again, on a thread of its own: a network file system whose server is gone may
/// block its caller for ever.
class HealthCheck {
public:
    /// `look`, the check, returns whether all is well, and must not throw. It is called every
    /// `interval`, and the first time at once.
    explicit HealthCheck(std::function<bool()> look,
                         std::chrono::milliseconds interval = std::chrono::seconds(5));

    HealthCheck(const HealthCheck&) = delete;
    HealthCheck& operator=(const HealthCheck&) = delete;

    /// Does not wait for a check that takes long.
    ~HealthCheck();

    /// Whether all was well at the last check, and that was within the last three intervals.
    bool isHealthy() const;

private:
    struct State;

    const std::shared_ptr<State> state_;
};

}  // namespace host
