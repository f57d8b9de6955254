// SPDX-License-Identifier: Apache-2.0
// A program that the host runs beside itself.
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <string>
#include <vector>

#include "platform/posix/file_descriptor.h"

namespace host {

/// A running program. It is killed with this object, and also when the thread that started it ends
/// for any reason. So it ends with the host.
class ChildProcess {
public:
    /// Starts `program`, with `arguments` and without any other of the host's files than its
    /// output. Its environment is the host's without GLIBC_TUNABLES, which is for the host's own
    /// memory, and with `variables`, each as "NAME=value". The limit that the host has set on its
    /// memory does not hold for it. It is in a process group of its own, so that an interrupt from
    /// the keyboard reaches the host alone. Throws std::system_error when the program cannot be
    /// run.
    ChildProcess(const std::filesystem::path& program, const std::vector<std::string>& arguments,
                 const std::vector<std::string>& variables = {});

    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;
    ~ChildProcess();

    pid_t id() const noexcept { return id_; }

    /// Where to read what the program writes to its standard output and standard error.
    int output() const noexcept { return output_.get(); }

    /// Sends `signal` to the program, unless it has been waited for.
    void send(int signal) const noexcept;

    /// Waits for the program's end and returns its reason, as "exit status 1" or "signal 9".
    std::string collect();

private:
    platform::FileDescriptor output_;
    pid_t id_ = -1;
};

}  // namespace host
