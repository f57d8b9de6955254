// SPDX-License-Identifier: Apache-2.0
// The command `read`: asks the bundle for files and prints its responses.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

namespace host {

struct ReadOptions {
    /// What is printed: the bundle's responses as they are; the same in valid UTF-8, with the
    /// file's path and charset added; or the texts alone, in UTF-8.
    enum class Form { response, utf8, text };

    std::filesystem::path bundle;
    std::vector<std::string> files;  ///< "-": the standard input.
    Form form = Form::response;
    std::string contentType;            ///< Of all requests; empty: by each file's contents.
    std::chrono::seconds timeout{300};  ///< How long to wait for a response.
};

/// Sends a read request for each file and writes what comes of it to `output` in the order of the
/// files: a line for each, also for one that there is no response for, or in the form `text` the
/// texts one after the other. `input` is what is read for "-". What fails, and what may not be what
/// was meant, is reported on standard error. Returns the exit status. Throws when the bundle cannot
/// be started, `input` not be read or `output` not be written.
int runRead(const ReadOptions& options, int input, int output);

}  // namespace host
