// SPDX-License-Identifier: Apache-2.0
// The command `write`: has the bundle write a document and prints its answer.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>

#include "host/guard/guard.h"

namespace host {

struct WriteOptions {
    std::filesystem::path bundle;
    std::string file;
    std::string contentType;        ///< Of the request; empty: by the content.
    std::string encoding{"UTF-8"};  ///< The charset of a text, as it comes in and as it is stored.
    std::chrono::seconds timeout{300};  ///< How long to wait for the answer.
    GuardOptions guard;
};

/// Reads the content from `input` to its end, sends a write request for it and writes the answer to
/// `output`, followed by a line feed. Without a content type, a document package's JSON goes to the
/// package writer and everything else is text. What fails is told on standard error. Returns the
/// exit status. Throws when the bundle cannot be started, `input` not be read or `output` not be
/// written, and when the content is no package but the file is one, or named as one: it stays as it
/// is unless a content type says that a text is meant.
int runWrite(const WriteOptions& options, int input, int output);

}  // namespace host
