// SPDX-License-Identifier: Apache-2.0
// A client of the message service whose write requests are saved so that no fault can make them
// lose a document.
#pragma once

#include <memory>

#include "host/guard/guard.h"
#include "platform/messaging/message_service.h"

namespace host {

/// A client that does what `client` does, except that write requests reach their handler through
/// the saves of `guard`, and the answers say what has happened to the document. A request that is
/// malformed reaches the handler as it is. The handler of read requests is stored in `guard` when
/// it is subscribed.
std::shared_ptr<platform::messaging::MessageService> savingSafely(
    std::shared_ptr<platform::messaging::MessageService> client, Guard guard);

}  // namespace host
