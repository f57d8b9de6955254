// SPDX-License-Identifier: Apache-2.0
// The service that tells clients about files, beside the bundle that reads and writes them. It
// creates, moves and deletes nothing; but it can make an earlier version of a document the present
// one.
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
    /// returned. What threads of the subscription may open is what clients may see. Without a
    /// history in `guard` there are no earlier versions. `roots` are the folders that clients are
    /// told of, in which their documents are.
    FileService(std::shared_ptr<platform::messaging::MessageService> client, Guard guard,
                std::vector<std::filesystem::path> roots);

private:
    std::shared_ptr<platform::messaging::Subscription> subscription_;
};

}  // namespace host
