// SPDX-License-Identifier: Apache-2.0
// Whether the folders that a host serves can be read, also when to find out takes for ever.
#pragma once

#include <chrono>
#include <filesystem>
#include <functional>
#include <memory>
#include <vector>

namespace host {

/// Whether all of `folders` can be read.
bool areReadable(const std::vector<std::filesystem::path>& folders);

/// Has a look again and again, on a thread of its own: a network file system whose server is gone
/// keeps whoever looks at it waiting, perhaps for ever.
class HealthCheck {
public:
    /// `look` returns whether all is well, and must not throw. It is called every `interval`, and
    /// the first time at once.
    explicit HealthCheck(std::function<bool()> look,
                         std::chrono::milliseconds interval = std::chrono::seconds(5));

    HealthCheck(const HealthCheck&) = delete;
    HealthCheck& operator=(const HealthCheck&) = delete;

    /// Does not wait for a look that takes long.
    ~HealthCheck();

    /// Whether all was well at the last look, and that was within the last three intervals.
    bool isHealthy() const;

private:
    struct State;

    const std::shared_ptr<State> state_;
};

}  // namespace host
