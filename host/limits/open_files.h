// SPDX-License-Identifier: Apache-2.0
// How many files and connections the process may have open.
#pragma once

namespace host {

/// Raises the limit of open files, which for most processes is at 1,024 by default, towards what
/// the system allows the process to have. Leaves it unchanged when that is not more. Throws
/// std::system_error.
void raiseOpenFileLimit();

}  // namespace host
