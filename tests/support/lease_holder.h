// SPDX-License-Identifier: Apache-2.0
// Another program that holds a lease on a file, as file servers do for their clients.
#pragma once

#include <filesystem>
#include <optional>

#include <sys/types.h>
#include <chrono>

namespace test {

/// A process that has a write lease on a file: programs that open the file have to wait until the
/// lease is released.
class LeaseHolder {
public:
    /// Takes the lease on `file`. When another process opens it, the lease is released after
    /// `delay`; without one, not before this object is destroyed.
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
