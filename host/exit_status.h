// SPDX-License-Identifier: Apache-2.0
// The program's exit statuses.
#pragma once

namespace host {

inline constexpr int exitDone = 0;           ///< All that was asked for has been done.
inline constexpr int exitRequestFailed = 1;  ///< A request failed, or the host could not work.
inline constexpr int exitWrongUsage = 2;     ///< The command line or the input's framing is wrong.

}  // namespace host
