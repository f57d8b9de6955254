// SPDX-License-Identifier: Apache-2.0
// Why a file cannot be read or written, for people: the bundle's answers do not say.
#pragma once

#include <string>

namespace host {

/// Why nothing can be read from `path`, such as "is a folder"; empty when it is a regular file that
/// can be opened.
std::string whyNotReadable(const std::string& path);

/// Why `path` cannot be written, such as "the folder /a/b does not exist"; empty when no reason is
/// found.
std::string whyNotWritable(const std::string& path);

}  // namespace host
