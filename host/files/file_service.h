// SPDX-License-Identifier: Apache-2.0
// The service that tells clients about files, next to the bundle, which reads and writes them. It
// creates, moves and deletes nothing, but it can restore an earlier version of a document.
#pragma once

#include <filesystem>
#include <memory>
#include <vector>

#include "host/guard/guard.h"
#include "platform/messaging/message_service.h"

namespace host {

/// Answers the requests that docs/protocol.md describes, as long as it lives.
class FileService {
public:
    /// Subscribes to the requests through `client`, whose futures have to be resolved when they are
    /// returned. Clients may see what the subscription's threads may open. Without a history in
    /// `guard` there are no earlier versions. `roots` are the folders of documents that clients are
    /// shown.
    FileService(std::shared_ptr<platform::messaging::MessageService> client, Guard guard,
                std::vector<std::filesystem::path> roots);

private:
    std::shared_ptr<platform::messaging::Subscription> subscription_;
};

}  // namespace host
