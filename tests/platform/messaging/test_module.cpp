// SPDX-License-Identifier: Apache-2.0
// A library that subscribes while it is loaded, in place of a bundle.

#include <memory>
#include <string>
#include <utility>

#include "platform/data_buffer.h"
#include "platform/messaging/message_service.h"

namespace {

using platform::DataBuffer;
using platform::messaging::JsonMessage;
using platform::messaging::MessageService;
using platform::messaging::Subscription;

// Part of a handler; the code of its destructor is this library's.
struct Handler {
    std::shared_ptr<MessageService> service;
    std::shared_ptr<std::string> text;

    void operator()(const JsonMessage& message) const {
        service->publish("/module/answer",
                         DataBuffer::copyOf(*text + std::string(message.payload())));
        throw text;  // an exception of a type whose code is here, too
    }
};

struct Module {
    std::shared_ptr<MessageService> service;
    std::shared_ptr<Subscription> subscription;
};

std::unique_ptr<Module> loaded;

}  // namespace

extern "C" [[gnu::visibility("default")]] void startModule(
    const std::shared_ptr<MessageService>& service) {
    auto started = std::make_unique<Module>();
    started->service = service;
    started->subscription =
        service
            ->subscribe("/module/request",
                        Handler{service, std::make_shared<std::string>("answer to ")})
            .get();
    loaded = std::move(started);
}

extern "C" [[gnu::visibility("default")]] void stopModule() {
    loaded.reset();
}
