// SPDX-License-Identifier: Apache-2.0
// The transport of the process, and the bus that is its default.
#include "platform/messaging/transport.h"

#include <mutex>

#include "platform/messaging/in_process_bus.h"

namespace platform::messaging {
namespace {

struct TransportChoice {
    std::mutex mutex;  // guards what follows
    Transport transport;
};

// Neither of these two is ever destroyed: threads and static objects of a process that exits may
// still use them.
TransportChoice& transportChoice() {
    static TransportChoice& choice = *new TransportChoice();
    return choice;
}

InProcessBus& processBus() {
    static const auto& bus = *new std::shared_ptr<InProcessBus>(InProcessBus::create());
    return *bus;
}

}  // namespace

void setTransport(Transport transport) {
    TransportChoice& choice = transportChoice();
    const std::lock_guard lock(choice.mutex);
    choice.transport.swap(transport);
}

futures::Future<std::shared_ptr<MessageService>> createMessageService(
    const std::string& clientName, const MessageServiceOptions& options) {
    Transport transport;
    {
        TransportChoice& choice = transportChoice();
        const std::lock_guard lock(choice.mutex);
        transport = choice.transport;
    }
    return transport ? transport(clientName, options) : processBus().connect(clientName);
}

}  // namespace platform::messaging
