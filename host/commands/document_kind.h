// SPDX-License-Identifier: Apache-2.0
// What a file's contents say about how it is to be read.
#pragma once

#include <filesystem>

namespace host {

/// Whether `file` is to be read as a document package: it begins as zip archives do, of which the
/// bundle can say what is wrong with it if it is another one. False for anything else, also for
/// what is no regular file or cannot be read.
bool isDocumentPackage(const std::filesystem::path& file);

}  // namespace host
