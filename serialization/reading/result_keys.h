// SPDX-License-Identifier: Apache-2.0
// The keys of a read request's result object, whichever reader makes it.
#pragma once

namespace EditorServices {

inline constexpr const char* kStatusKey = "status";
inline constexpr const char* kDataKey = "data";
inline constexpr const char* kExceptionKey = "exception";

}  // namespace EditorServices
