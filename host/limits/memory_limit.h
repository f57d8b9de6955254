// SPDX-License-Identifier: Apache-2.0
// A bound on the memory of the process, so that a document that is too large for the machine is an
// error of its request and not the end of the process, or of another.
#pragma once

#include <cstdint>

namespace host {

/// Three quarters of the memory, in bytes, that the machine has, or that the control group of the
/// process may use when that is less.
std::uint64_t defaultMemoryLimit();

/// Makes allocations fail that would take the process's memory above `bytes`. A limit that was set
/// from outside is never raised. Throws std::system_error when the system refuses.
void limitMemory(std::uint64_t bytes);

}  // namespace host
