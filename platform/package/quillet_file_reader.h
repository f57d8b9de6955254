// SPDX-License-Identifier: Apache-2.0
// Reads document packages: zip archives laid out by the Open Packaging Conventions.
#pragma once

#include <string>

#include "platform/package/quillet_file_package.h"

namespace platform::package {

class QuilletFileReader {
public:
    /// A reader of the package file at `path`. Touches nothing on disk.
    explicit QuilletFileReader(std::u16string path);

    /// Reads the package whole. Its parts are the entries of the archive that have a content type,
    /// in the archive's order, less the relationships parts, which become the relationships of the
    /// parts they belong to. What is no regular file is refused, and not waited for.
    ///
    /// Throws std::runtime_error beginning with the path and saying what is wrong with which part
    /// when the file cannot be read, is no package, is damaged, or goes beyond zip/limits.h, and
    /// when the path is not valid UTF-16. Takes time and memory in proportion to the expanded
    /// content, each part of which is expanded once, to where it stays.
    QuilletFilePackage read();

private:
    std::u16string path_;
};

}  // namespace platform::package
