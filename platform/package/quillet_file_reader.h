// SPDX-License-Identifier: Apache-2.0
// Reads document packages: zip archives laid out by the Open Packaging Conventions.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/package/quillet_file_package.h"

namespace platform::package {

/// How large a package is, as its archive declares it. Reading fails when this is not true.
struct PackageSize {
    std::size_t parts = 0;
    std::uint64_t content = 0;        ///< Bytes of the parts, expanded.
    std::uint64_t relationships = 0;  ///< Bytes of what holds their relationships, expanded.
    std::uint64_t compressed = 0;     ///< Bytes of the largest of all these as it is stored.
};

class QuilletFileReader {
public:
    /// A reader of the package file at `path`. Touches nothing on disk.
    explicit QuilletFileReader(std::u16string path);
    QuilletFileReader(const QuilletFileReader&) = delete;
    QuilletFileReader& operator=(const QuilletFileReader&) = delete;
    ~QuilletFileReader();

    /// The size of the package, without allocating its parts. The file stays open for
    /// read(). Throws what read() throws, but says nothing about what is in the parts.
    PackageSize size();

    /// Reads the package whole. Its parts are the entries of the archive that have a content type,
    /// in the archive's order, less the relationships parts, which become the relationships of the
    /// parts they belong to. What is not a regular file is refused, and not waited for.
    ///
    /// Throws std::runtime_error beginning with the path and saying what is wrong with which part
    /// when the file cannot be read, is not a package, is damaged, or goes beyond zip/limits.h, and
    /// when the path is not valid UTF-16. Takes time and memory in proportion to the expanded
    /// content, each part of which is expanded once, directly into its place.
    QuilletFilePackage read();

private:
    class PackageFile;

    template <class Work>
    auto withFile(Work work);

    std::u16string path_;
    std::unique_ptr<PackageFile> file_;  // Between size() and read().
};

}  // namespace platform::package
