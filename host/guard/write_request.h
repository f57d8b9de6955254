// SPDX-License-Identifier: Apache-2.0
// Reads the members of a write request that the guard needs before the bundle gets it.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "json/value.h"

namespace host {

/// The members of a write request that say what is to be saved where.
struct WriteRequest {
    std::string rtcId;
    std::string filePath;
    std::string_view filePathText;  // the string as it stands in the request, in quotation marks
    bool isPackage = false;
    std::string_view text;    // a text as it stands in the request: JSON, of the charset `encoding`
    std::string encoding;     // of a text
    json::Value baseVersion;  // Undefined where there is none
};

/// The request that `payload` holds, or nothing where it is none that the bundle would answer: it
/// is not an object, or lacks a member or has one of another kind. The content of a package is
/// skipped; what is between its brackets is not checked. The result lasts no longer than
/// `payload`. Linear in the size of `payload`.
std::optional<WriteRequest> readWriteRequest(std::string_view payload);

/// `payload`, which is an object with members, with a member "filePath" put in front of the others.
/// Of two members of one name the first counts.
std::string withFilePath(std::string_view payload, const std::string& filePath);

/// Replaces the path in the text of a request without copying it: copying a large request would
/// take as much memory again. The bytes of the request are overwritten, and restored by the
/// destructor; they must be writable, and nothing else may read them in between.
class PathOverwrite {
public:
    /// Writes `filePath` over `filePathText` of a request, where there is room for it.
    PathOverwrite(std::string_view filePathText, const std::string& filePath);
    PathOverwrite(const PathOverwrite&) = delete;
    PathOverwrite& operator=(const PathOverwrite&) = delete;
    ~PathOverwrite();

    /// Whether there was room. The request is unchanged otherwise.
    bool isDone() const noexcept { return isDone_; }

private:
    char* const place_;
    const std::string own_;
    bool isDone_;
};

}  // namespace host
