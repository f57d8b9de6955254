// SPDX-License-Identifier: Apache-2.0
// The signals that ask the program to shut down.
#pragma once

#include <functional>
#include <future>
#include <thread>

#include "platform/posix/event.h"
#include "platform/posix/file_descriptor.h"

namespace host {

/// Blocks SIGTERM and SIGINT in the calling thread and in those that it starts from now on, so that
/// StopSignals takes them. Must be called before any other thread is started.
void blockStopSignals();

/// Handles SIGTERM and SIGINT: the first signal asks the program to shut down, the second
/// ends the process at once, with the exit status of a failure.
class StopSignals {
public:
    /// `abandon` is called, on a thread that is started now, before the process is ended at once.
    /// Throws std::system_error.
    explicit StopSignals(std::function<void()> abandon);

    StopSignals(const StopSignals&) = delete;
    StopSignals& operator=(const StopSignals&) = delete;

    /// From now on, signals stay pending.
    ~StopSignals();

    /// Becomes ready with the first signal.
    const std::shared_future<void>& first() const noexcept { return first_; }

    /// A descriptor that is readable from the first signal on, to be polled with others. By then
    /// `first` is ready.
    int descriptor() const noexcept { return came_.descriptor(); }

private:
    void take();

    std::function<void()> abandon_;
    platform::FileDescriptor signals_;
    platform::Event came_;
    platform::Event end_;  // This object's life ends.
    std::promise<void> whenFirst_;
    std::shared_future<void> first_ = whenFirst_.get_future().share();
    std::thread thread_;
};

}  // namespace host
