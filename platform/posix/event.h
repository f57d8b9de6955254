// SPDX-License-Identifier: Apache-2.0
// An event that a thread can wait for together with input.
#pragma once

#include <sys/eventfd.h>

#include "platform/posix/file_descriptor.h"
#include "platform/posix/system_error.h"

namespace platform {

/// Happens once. May be used by any thread.
class Event {
public:
    /// Throws std::system_error.
    Event() : descriptor_(::eventfd(0, EFD_CLOEXEC)) {
        if (!descriptor_) {
            throwSystemError("cannot make an event");
        }
    }

    /// Wakes all that wait for the event.
    void set() const noexcept {
        // Whatever made the call fail, they would otherwise wait for ever.
        while (::eventfd_write(descriptor_.get(), 1) != 0) {
        }
    }

    /// A descriptor that is readable from `set` on.
    int descriptor() const noexcept { return descriptor_.get(); }

private:
    FileDescriptor descriptor_;
};

}  // namespace platform
