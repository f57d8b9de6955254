// SPDX-License-Identifier: Apache-2.0
// What a client gets whose document is too large for the servers that the answer goes through.
#pragma once

#include <memory>

#include "platform/messaging/message_service.h"

namespace host {

/// A client that does what `client` does, except that when the answer to a read request cannot be
/// published it publishes one that says why: {"exception": <the reason>, "status": false}. Without
/// it, whoever asked would wait for an answer that never comes. The futures of `client` have to be
/// resolved when they are returned.
std::shared_ptr<platform::messaging::MessageService> tellingWhatIsNotSent(
    std::shared_ptr<platform::messaging::MessageService> client);

}  // namespace host
