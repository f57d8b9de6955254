// SPDX-License-Identifier: Apache-2.0
// Answers for read requests that would otherwise get none: the bundle publishes nothing when it has
// no memory for a document, or when its answer cannot be sent.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/messaging/message_service.h"

namespace host {

/// Publishes {"exception": `reason`, "status": false} through `client` as the answer to `request`,
/// the payload of a read request. Does nothing when the request names no "rtcId".
void answerFailedRead(platform::messaging::MessageService& client, std::string_view request,
                      const std::string& reason);

/// A client that does what `client` does, and publishes an answer with an "exception" for each read
/// request whose handler runs out of memory, and in place of each answer to one that cannot be
/// published. The futures of `client` have to be resolved when they are returned.
std::shared_ptr<platform::messaging::MessageService> answeringFailedReads(
    std::shared_ptr<platform::messaging::MessageService> client);

}  // namespace host
