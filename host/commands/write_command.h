// SPDX-License-Identifier: Apache-2.0
// The command `write`: has the bundle write a document and prints its answer.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>

#include "host/guard/guard.h"

namespace host {

/// The content type that asks for a document package; every other one means a text.
inline constexpr const char* packageContentType = "text/xml";

struct WriteOptions {
    std::filesystem::path bundle;
    std::string file;
    std::string contentType;  ///< Of the request; empty: by the content.
    bool isUtf8Text = false;  ///< Whether the content is a text that comes in as UTF-8.
    std::string encoding;     ///< In which a text is stored, and comes in unless that is UTF-8;
                              ///< empty: the file's own for isUtf8Text, else UTF-8.
    std::chrono::seconds timeout{300};  ///< How long to wait for the answer.
    GuardOptions guard;
};

/// Reads the content from `input` to its end, sends a write request for it and writes the answer to
/// `output`, followed by a line feed. Without a content type, a document package's JSON goes to the
/// package writer and everything else is text. A text that comes in as UTF-8 and is the text of the
/// file already leaves the file unchanged, byte for byte; any other keeps the file's byte-order
/// mark.
///
/// Failures are reported on standard error. Returns the exit status. Throws when the bundle cannot
/// be started, `input` not be read or `output` not be written. The same, before the file is
/// touched, when a text that comes in as UTF-8 does not fit the charset, and when the content is
/// not a package but the file is one, or named as one, unless a content type says that a text is
/// meant.
int runWrite(const WriteOptions& options, int input, int output);

}  // namespace host
