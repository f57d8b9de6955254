// SPDX-License-Identifier: Apache-2.0
// Chooses what carries the messages of this process.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "futures/future.h"
#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// Creates clients; called with the arguments of createMessageService.
using Transport = std::function<futures::Future<std::shared_ptr<MessageService>>(
    const std::string& clientName, const MessageServiceOptions& options)>;

/// Sets what createMessageService calls from now on. Until the first call, and after one with an
/// empty function, that is an InProcessBus with default options, which the whole process shares.
/// Thread-safe.
[[gnu::visibility("default")]] void setTransport(Transport transport);

}  // namespace platform::messaging
