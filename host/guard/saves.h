// SPDX-License-Identifier: Apache-2.0
// Saves that cannot lose a document, whatever fails.
//
// The bundle writes texts in place and reports only whether it could open the file. So it is given
// another path, of a new file in the same folder, and what it wrote there is compared with what was
// asked for, made safe on disk, and takes the old file's place by renaming. Where a new file cannot
// replace the old one (which has other names, is a mount point or belongs to somebody else, or
// whose folder takes no new file) the bundle writes to memory, and that is copied over the old
// content, which is kept to be put back and is an earlier version by then. Packages are saved by
// renaming in any case.
#pragma once

#include <cstddef>
#include <exception>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include "host/guard/history.h"
#include "host/guard/leftovers.h"
#include "host/guard/save_locks.h"
#include "host/guard/write_request.h"
#include "platform/posix/file_descriptor.h"

namespace host {

/// The bundle's answer to a write request.
struct BundleAnswer {
    bool isWritten = false;
    bool existed = false;
};

/// Makes the bundle handle the request, with `otherPath` in place of its path unless that is empty.
/// Throws BundleFailure.
using AskBundle = std::function<BundleAnswer(const std::string& otherPath)>;

/// Waits until there is memory for so many bytes (MessageService::awaitMemory).
using AwaitMemory = std::function<void(std::size_t bytes)>;

/// The bundle ended a request with an exception, and so without an answer. It is not a
/// std::exception, which would be a failed save with an answer.
struct BundleFailure {
    std::exception_ptr exception;
};

struct SaveResult {
    bool isSaved = false;
    bool existed = false;
    std::string version;  // that was made, where the request names the one it is based on

    /// What was replaced, unless the history has it. Closing it deletes it, which takes some
    /// milliseconds for a large file; so it is closed after the answer.
    platform::FileDescriptor replaced;
};

/// Saves documents. May be used by several threads at once.
class Saves {
public:
    /// `history` gets what saves replace; it may be null. `lockFile` is that of SaveLocks.
    Saves(const std::filesystem::path& lockFile, std::shared_ptr<History> history);

    /// Saves what `request` holds. When isSaved is false, the document is as it was (unless only
    /// its folder could not be made safe on disk), and the log has the reason. Throws BundleFailure
    /// where the bundle gives no answer; the document is as it was then.
    SaveResult save(const WriteRequest& request, const AskBundle& askBundle,
                    const AwaitMemory& awaitMemory);

    /// Makes the content of the open file `version` that of the document at `path`, which it
    /// replaces as a save does. Throws std::runtime_error when that fails; the document is then as
    /// it was, unless only its folder could not be made safe on disk.
    void restore(const std::string& path, int version);

private:
    SaveLocks locks_;
    Leftovers leftovers_;
    std::shared_ptr<History> history_;
};

}  // namespace host
