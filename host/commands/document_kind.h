// SPDX-License-Identifier: Apache-2.0
// What a file's contents say about how it is to be read.
#pragma once

#include <filesystem>

namespace host {

/// Whether `file` is a document package: a zip archive with an item "[Content_Types].xml". False
/// for anything else, also for what is no regular file or cannot be read. Reads the archive's
/// directory only.
bool isDocumentPackage(const std::filesystem::path& file);

}  // namespace host
