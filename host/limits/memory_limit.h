// SPDX-License-Identifier: Apache-2.0
// A bound on the memory of the process, so that a document that is too large for the machine fails
// its request and does not end this process or another.
#pragma once

#include <cstdint>

namespace host {

/// Three quarters of the machine's memory in bytes, or of what the process's control group may use
/// if that is less.
std::uint64_t defaultMemoryLimit();

/// Makes allocations fail that would take the process's memory above `bytes`, and has threads that
/// are started from then on get stacks of 1 MB, all of which counts. A limit that was set from
/// outside is never raised. Returns the limit that holds. Throws std::system_error when the
/// system refuses.
std::uint64_t limitMemory(std::uint64_t bytes);

/// What requests, the values in them and answers that wait to be taken may take together, in bytes,
/// in a process that may take `limit` bytes. The other half is for the documents that they read and
/// write, and the program.
constexpr std::uint64_t memoryForRequests(std::uint64_t limit) {
    return limit / 2;
}

/// What documents that are read, and their JSON, may take together, in bytes, beside
/// `memoryForRequests`. The rest is for what is written, and the program.
constexpr std::uint64_t memoryForDocuments(std::uint64_t memoryForRequests) {
    return memoryForRequests / 4 * 3;
}

}  // namespace host
