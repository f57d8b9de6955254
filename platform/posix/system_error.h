// SPDX-License-Identifier: Apache-2.0
// Failures of the operating system as exceptions.
#pragma once

#include <cerrno>
#include <system_error>

namespace platform {

/// Throws std::system_error for the call that has just failed. `what` says what cannot be done.
[[noreturn]] inline void throwSystemError(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace platform
