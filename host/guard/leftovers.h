// SPDX-License-Identifier: Apache-2.0
// Removes what saves that were killed have left behind.
#pragma once

#include <chrono>
#include <map>
#include <mutex>
#include <string>
#include <utility>

#include <sys/types.h>

namespace host {

/// Removes temporary files of saves that are older than a day. A folder is searched at most once an
/// hour.
class Leftovers {
public:
    /// Searches the folder of the document at `path`. Failures are ignored.
    void removeBeside(const std::string& path) noexcept;

private:
    using Clock = std::chrono::steady_clock;

    bool isDue(dev_t device, ino_t folder);

    std::mutex mutex_;
    std::map<std::pair<dev_t, ino_t>, Clock::time_point> lookedThrough_;  // guarded by mutex_
};

}  // namespace host
