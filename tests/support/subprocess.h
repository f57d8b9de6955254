// SPDX-License-Identifier: Apache-2.0
// A program run with pipes on its standard streams.
#pragma once

#include <sys/types.h>

#include <future>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/posix/file_descriptor.h"
#include "tests/support/child_process.h"

namespace test {

/// What a program that has ended leaves behind.
struct Outcome {
    int status = 0;  ///< Its exit status; when a signal ended it, minus the signal's number.
    std::string output;
    std::string errors;
};

/// Runs a program with pipes on its standard streams. Kills it when it has not been waited for.
/// Errors of the system calls are exceptions.
class Subprocess {
public:
    /// Starts `command`: the path of a program and its arguments.
    explicit Subprocess(const std::vector<std::string>& command);

    Subprocess(const Subprocess&) = delete;
    Subprocess& operator=(const Subprocess&) = delete;

    pid_t id() const noexcept { return process_->id(); }

    void write(std::string_view input);
    void closeInput() { input_ = {}; }

    /// Up to 64 KiB of what the program writes to its standard output; empty at the end of it.
    std::string readSome();
    void closeOutput() { output_ = {}; }

    /// Reads what is left of the output and waits for the program's end.
    Outcome waitForEnd();

    /// Closes the input and waits for the program's end.
    Outcome finish();

private:
    platform::FileDescriptor input_;
    platform::FileDescriptor output_;
    std::future<std::string> errors_;  // Waits for the end of what the program writes.
    std::optional<ChildProcess> process_;
};

/// Runs `command` with `input` on its standard input until it ends.
Outcome run(const std::vector<std::string>& command, std::string_view input = {});

}  // namespace test
