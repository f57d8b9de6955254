// SPDX-License-Identifier: Apache-2.0
// Whether the clients of the host's own message server have received what was sent to them.
#pragma once

#include <chrono>

#include "host/server/nats_process.h"
#include "platform/messaging/nats/nats_bus.h"

namespace host {

/// Waits until the clients of the server at `ports` have read all that it holds for them: a server
/// that is stopped drops what it has not sent, and what it has sent is lost with the connection
/// when a client sends something just then. `worker` says how to connect to it. Returns false when
/// that takes longer than `timeout`. Throws std::runtime_error when the server cannot be asked.
bool waitForDelivery(const platform::messaging::NatsOptions& worker, const NatsPorts& ports,
                     std::chrono::milliseconds timeout);

}  // namespace host
