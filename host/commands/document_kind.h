// SPDX-License-Identifier: Apache-2.0
// What a file's contents say about how it is to be read.
#pragma once

#include <filesystem>

namespace host {

/// Whether `file` is to be read as a document package: it begins like a zip archive. If it is some
/// other archive, the bundle can say what is wrong with it. False for anything else, including what
/// is not a regular file or cannot be read.
bool isDocumentPackage(const std::filesystem::path& file);

}  // namespace host
