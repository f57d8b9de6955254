// SPDX-License-Identifier: Apache-2.0
// Writes document packages: zip archives laid out by the Open Packaging Conventions.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "platform/package/quillet_file_package.h"

namespace platform {
class AtomicFile;
}

namespace platform::package {

/// Writes a package to a file in two steps: `write` prepares the new file beside the target,
/// `close` puts it in the target's place or discards it. Readers of the target find the old
/// document or the new one, whatever fails in between (see AtomicFile).
class QuilletFileWriter {
public:
    /// A writer to the file at `path`. Touches nothing on disk. `creatorAndTitle` go into the core
    /// properties of the package, which get no part if both are empty.
    QuilletFileWriter(std::u16string path,
                      std::pair<std::u16string, std::u16string> creatorAndTitle);
    QuilletFileWriter(const QuilletFileWriter&) = delete;
    QuilletFileWriter& operator=(const QuilletFileWriter&) = delete;

    /// Drops what was written and not closed.
    ~QuilletFileWriter();

    /// Writes `package` beside the target, in place of what an earlier call wrote: the content
    /// types, the package's relationships, then the parts in their order, each followed by its
    /// relationships. Equal packages give equal bytes if both are written to new files or over
    /// equal ones: where the target has an entry of the same name and content, the deflated bytes
    /// of that are reused, whichever program wrote them.
    ///
    /// A relationship, such as a hyperlink, becomes external if its target mode is 0 and also if
    /// its target can be no part of the package: an absolute URI, or a reference that leads to none
    /// of its parts. The top-level type of a content type is stored in lower case. Everything else
    /// is stored as it is.
    ///
    /// Throws std::runtime_error, beginning with the path and naming the part, when the package is
    /// one that could not be read back (an invalid or reserved part name, two that are equal but
    /// for case or escapes, no content type, a relationship without id or type, two of one id, text
    /// that XML or UTF-8 cannot hold, more than zip/limits.h allows), when it has core properties
    /// and others are given, and when the target may not be written or the file system refuses.
    /// Time in proportion to the content; memory for the largest part once or twice more.
    void write(const QuilletFilePackage& package);

    /// Ends the writing: replaces the target by what was written, safe on disk when it returns, or
    /// discards it if `discard`. Does nothing when nothing was written since the last call. Throws
    /// std::runtime_error beginning with the path when that fails; what was written is dropped.
    void close(bool discard);

private:
    std::u16string path_;
    std::pair<std::u16string, std::u16string> creatorAndTitle_;
    std::unique_ptr<AtomicFile> file_;  // what was written and not closed
};

}  // namespace platform::package
