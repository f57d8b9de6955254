// SPDX-License-Identifier: Apache-2.0
// Waits for what a NATS server still has to send to its clients.
#pragma once

#include <chrono>

#include "platform/messaging/nats/nats_bus.h"

namespace platform::messaging {

/// Waits until the server that `options` name has sent all that it holds for the clients of this
/// account. A server that is stopped earlier drops it. Returns false when that took longer than
/// `timeout`; throws std::runtime_error when the server cannot be asked.
[[gnu::visibility("default")]] bool waitForClientBacklog(const NatsOptions& options,
                                                         std::chrono::milliseconds timeout);

}  // namespace platform::messaging
