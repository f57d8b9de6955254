// SPDX-License-Identifier: Apache-2.0
// A bundle for the host's failures: it prints where the host's results go, answers no request but
// one for a file named "answered", and never comes back from one for a file named "stuck".
#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <memory>
#include <string_view>

#include "cppmicroservices/BundleActivator.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"

namespace {

using cppmicroservices::BundleActivator;
using cppmicroservices::BundleContext;
using cppmicroservices::BundleContextPrivate;
using platform::messaging::JsonMessage;

class UnresponsiveActivator final : public BundleActivator {
public:
    void Start(BundleContext) override {
        std::puts("printed with puts");
        std::fflush(stdout);
        std::cout << "printed with cout" << std::endl;

        client_ = platform::messaging::createMessageService("unresponsive", {}).get();
        subscription_ = client_
                            ->subscribe(platform::messaging::readRequestChannel,
                                        [this](const JsonMessage& message) { handle(message); })
                            .get();
    }

    void Stop(BundleContext) override {}

private:
    void handle(const JsonMessage& message) {
        const std::string_view request = message.payload();
        if (request.find("stuck") != std::string_view::npos) {
            std::fputs("stuck in a request\n", stderr);
            for (;;) {
                ::pause();
            }
        }
        if (request.find("answered") != std::string_view::npos) {
            answer("{\"data\":\"x\",\"status\":true}");
        } else if (request.find("garbled") != std::string_view::npos) {
            answer("no JSON");
        }
    }

    // Answers the host's second request.
    void answer(std::string_view response) {
        client_->publish("/zpr/service/readResponse/1", platform::DataBuffer::copyOf(response));
    }

    std::shared_ptr<platform::messaging::MessageService> client_;
    std::shared_ptr<platform::messaging::Subscription> subscription_;
};

}  // namespace

extern "C" {

[[gnu::visibility("default")]] void _us_set_bundle_context_instance_unresponsive_bundle(
    BundleContextPrivate*) {}

[[gnu::visibility("default")]] BundleActivator* _us_create_activator_unresponsive_bundle() {
    return std::make_unique<UnresponsiveActivator>().release();
}

[[gnu::visibility("default")]] void _us_destroy_activator_unresponsive_bundle(
    BundleActivator* activator) {
    delete activator;
}

}  // extern "C"
