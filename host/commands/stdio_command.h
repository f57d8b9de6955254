// SPDX-License-Identifier: Apache-2.0
// The command `stdio`: the message bus on standard input and output.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>

#include "host/guard/guard.h"

namespace host {

struct StdioOptions {
    std::filesystem::path bundle;
    std::size_t largestMessage = std::size_t{1} << 30;  ///< Of the input, in bytes.
    GuardOptions guard{false};                          ///< The command shows the bare bundle.

    /// The bytes that requests and the values in them may take together; 0: as many as they need.
    std::uint64_t memoryForRequests = 0;
};

/// Sends the messages that come framed on `input` to the bundle, and writes every message that the
/// bundle publishes framed to `output`. At the end of the input, and also when a frame is malformed
/// or the output cannot be written any more, it finishes the requests that it has taken before it
/// returns the exit status. Throws std::runtime_error when the bundle cannot be started.
int runStdio(const StdioOptions& options, int input, int output);

}  // namespace host
