// SPDX-License-Identifier: Apache-2.0
// The signals that ask the program to end.
#pragma once

#include <functional>
#include <future>
#include <thread>

#include "platform/posix/file_descriptor.h"

namespace host {

/// Blocks SIGTERM and SIGINT in the calling thread and in those that it starts from now on, so that
/// StopSignals takes them. To be called before any other thread is started.
void blockStopSignals();

/// Takes SIGTERM and SIGINT as requests to end in good order: the first is told to whoever waits
/// for it, the second ends the process at once, with the exit status of a failure.
class StopSignals {
public:
    /// `abandon` is called, on a thread that is started now, before the process is ended at once.
    /// Throws std::system_error.
    explicit StopSignals(std::function<void()> abandon);

    StopSignals(const StopSignals&) = delete;
    StopSignals& operator=(const StopSignals&) = delete;

    /// From now on, the signals wait.
    ~StopSignals();

    /// Becomes ready with the first signal.
    const std::shared_future<void>& first() const noexcept { return first_; }

    /// A descriptor that is readable from the first signal on, for those who wait for others too.
    /// By then `first` is ready.
    int descriptor() const noexcept { return came_.get(); }

private:
    void take();

    std::function<void()> abandon_;
    platform::FileDescriptor signals_;
    platform::FileDescriptor came_;
    platform::FileDescriptor end_;  // Becomes readable when this object's life ends.
    std::promise<void> whenFirst_;
    std::shared_future<void> first_ = whenFirst_.get_future().share();
    std::thread thread_;
};

}  // namespace host
