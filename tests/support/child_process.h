// SPDX-License-Identifier: Apache-2.0
// A program that runs beside a test and does not outlive it.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace test {

/// The descriptors that become the standard streams of a program; -1: those of this process.
struct StandardStreams {
    int input = -1;
    int output = -1;
    int errors = -1;
};

/// A running program. Killed with this object, and when the thread that started it ends.
class ChildProcess {
public:
    /// Starts `command`: a program, which is looked for in the search path and in /usr/sbin, and
    /// its arguments. Throws std::system_error when there can be no other process; a program that
    /// is not found is one that has ended.
    explicit ChildProcess(std::vector<std::string> command, const StandardStreams& streams = {});

    ChildProcess(ChildProcess&& other) noexcept;
    ChildProcess& operator=(ChildProcess&& other) noexcept;
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;
    ~ChildProcess();

    pid_t id() const noexcept { return id_; }

    /// Ends it with SIGKILL.
    void kill();

    void signal(int number) const;

    /// Waits for its end; returns its exit status, or minus the number of the signal that ended it,
    /// or -1 when it has been waited for before.
    int wait();

    /// Looks whether it has ended, without waiting.
    bool hasEnded();

private:
    pid_t id_ = -1;  // -1: it has ended and been waited for
};

}  // namespace test
