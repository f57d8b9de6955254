// SPDX-License-Identifier: Apache-2.0
// The messaging library's log.
#pragma once

#include <spdlog/fwd.h>

#include <string_view>

namespace platform::messaging {

/// The logger "messaging": one of that name that exists already, or else one that writes to
/// standard error. Valid for the life of the process.
spdlog::logger& logger();

/// Logs the exception that is being handled as the failure of `callback` ("handler", "observer")
/// with a message on `channel`. To be called in a catch block.
void logFailure(std::string_view callback, std::string_view channel) noexcept;

/// Logs the exception that is being handled as the reason why a message was lost on its way to its
/// handler, or a part of a long one. To be called in a catch block.
void logLoss() noexcept;

}  // namespace platform::messaging
