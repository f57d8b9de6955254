// SPDX-License-Identifier: Apache-2.0
// What the tests of the message bus share.
#pragma once

#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "platform/data_buffer.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"

namespace platform::messaging {

inline std::shared_ptr<MessageService> clientOf(InProcessBus& bus,
                                                const std::string& name = "client") {
    return bus.connect(name).get();
}

inline std::shared_ptr<Subscription> subscribe(MessageService& client, const std::string& channel,
                                               MessageHandler handler) {
    return client.subscribe(channel, std::move(handler)).get();
}

inline void publish(MessageService& client, const std::string& channel, std::string_view text) {
    client.publish(channel, DataBuffer::copyOf(text)).get();
}

inline std::string textOf(const JsonMessage& message) {
    return std::string(message.payload());
}

/// Lets this process start no more threads.
inline void forbidThreads() {
    const rlimit none{0, 0};
    setrlimit(RLIMIT_NPROC, &none);
    if (geteuid() == 0) {
        syscall(SYS_setuid, 65534);  // no such limit holds for root
    }
}

}  // namespace platform::messaging
