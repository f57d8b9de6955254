// SPDX-License-Identifier: Apache-2.0
// Connects the service object to the message service.

#include <exception>
#include <stdexcept>
#include <utility>

#include "serialization/serialization.h"

namespace EditorServices {

using futures::Future;
using futures::Promise;
using platform::messaging::createMessageService;
using platform::messaging::JsonMessage;
using platform::messaging::MessageService;
using platform::messaging::MessageServiceOptions;

void Serialization::initializeMessageService() {
    auto creation = createMessageService(serviceName, MessageServiceOptions{});

    Promise<void> started;
    // Nobody waits for start-up, so it never blocks the host.
    static_cast<void>(started.getFuture());

    auto onMessageServiceReady = [this, started = std::move(started)](
                                     Future<std::shared_ptr<MessageService>> client) mutable {
        try {
            messageService = client.get();
            if (!messageService) {
                throw std::runtime_error("The message service gave no client.");
            }
            readSubscription =
                messageService
                    ->subscribe(readRequestChannel,
                                [this](const JsonMessage& message) { handleReadRequest(message); })
                    .get();
            writeSubscription =
                messageService
                    ->subscribe(writeRequestChannel,
                                [this](const JsonMessage& message) { handleWriteRequest(message); })
                    .get();
        } catch (...) {
            started.setException(std::current_exception());
            return;
        }
        started.setValue();
    };
    std::move(creation).then(std::move(onMessageServiceReady));
}

}  // namespace EditorServices
