// SPDX-License-Identifier: Apache-2.0
// The command `read`: asks the bundle for files and prints its responses.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

namespace host {

struct ReadOptions {
    std::filesystem::path bundle;
    std::vector<std::string> files;
    std::string contentType;            ///< Of all requests; empty: by each file's contents.
    std::chrono::seconds timeout{300};  ///< How long to wait for a response.
};

/// Sends a read request for each file and writes the responses to `output` in the order of the
/// files, each followed by a line feed. What fails is told on standard error. Returns the exit
/// status. Throws when the bundle cannot be started or `output` not be written.
int runRead(const ReadOptions& options, int output);

}  // namespace host
