// SPDX-License-Identifier: Apache-2.0
// Another program that holds a lease of a file, as file servers do for their clients.
#pragma once

#include <filesystem>
#include <optional>

#include <sys/types.h>
#include <chrono>

namespace test {

/// A process that has a write lease of a file: whoever opens the file has to wait until it lets go.
class LeaseHolder {
public:
    /// Takes the lease of `file`. When another process opens that, it lets go after `delay`; never,
    /// as long as this object lives, without one.
    LeaseHolder(const std::filesystem::path& file, std::optional<std::chrono::milliseconds> delay);
    LeaseHolder(const LeaseHolder&) = delete;
    LeaseHolder& operator=(const LeaseHolder&) = delete;
    ~LeaseHolder();

    /// Whether the lease was granted: not all file systems know leases.
    bool hasLease() const noexcept { return hasLease_; }

private:
    pid_t process_ = -1;
    bool hasLease_ = false;
};

}  // namespace test
