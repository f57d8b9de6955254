// SPDX-License-Identifier: Apache-2.0
// Clears away what saves left behind that were killed.
#pragma once

#include <chrono>
#include <map>
#include <mutex>
#include <string>
#include <utility>

#include <sys/types.h>

namespace host {

/// Removes temporary files of saves that are older than a day. A folder is looked through once an
/// hour at most.
class Leftovers {
public:
    /// Looks through the folder of the document at `path`. Failures do not matter.
    void removeBeside(const std::string& path) noexcept;

private:
    using Clock = std::chrono::steady_clock;

    bool isDue(dev_t device, ino_t folder);

    std::mutex mutex_;
    std::map<std::pair<dev_t, ino_t>, Clock::time_point> lookedThrough_;  // guarded by mutex_
};

}  // namespace host
