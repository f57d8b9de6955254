// The messaging library's log.
#pragma once

#include <string_view>

namespace platform::messaging {

/// Logs the exception that is being handled as the failure of `callback` ("handler", "observer")
/// with a message on `channel`. To be called in a catch block.
void logFailure(std::string_view callback, std::string_view channel) noexcept;

}  // namespace platform::messaging
