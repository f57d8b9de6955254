// SPDX-License-Identifier: Apache-2.0
// The keys of a read request's result object, for both readers.
#pragma once

namespace EditorServices {

inline constexpr const char* statusKey = "status";
inline constexpr const char* dataKey = "data";
inline constexpr const char* exceptionKey = "exception";

}  // namespace EditorServices
