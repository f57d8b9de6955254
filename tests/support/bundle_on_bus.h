// SPDX-License-Identifier: Apache-2.0
// The bundle on a bus of its own in this process, with a client next to it: for tests, benchmarks
// and fuzz targets.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "futures/future.h"
#include "platform/data_buffer.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"
#include "platform/messaging/transport.h"

namespace test {

/// `Bundle` is what starts it when it is made, and ends it: framework::BundleRunner for the
/// library, EditorServices::Serialization for the service object alone.
template <class Bundle>
class BundleOnBus {
public:
    /// Called for each message that the bundle publishes, on the thread that publishes it.
    using Published = std::function<void(const platform::messaging::JsonMessage&)>;

    struct Setup {
        platform::messaging::InProcessBusOptions bus = {};
        /// Makes the bundle's client from the bus's own; empty: the bundle gets the bus's own.
        std::function<std::shared_ptr<platform::messaging::MessageService>(
            std::shared_ptr<platform::messaging::MessageService>)>
            wrapClient = {};
    };

    /// Starts `Bundle(arguments...)`.
    template <class... Arguments>
    explicit BundleOnBus(Published published, Setup setup = {}, Arguments&&... arguments)
        : bus_(platform::messaging::InProcessBus::create(std::move(setup.bus))),
          client_(bus_->connect("client").get()),
          observation_(bus_->observe(
              [published = std::move(published)](std::string_view sender,
                                                 const platform::messaging::JsonMessage& message) {
                  if (sender == "EditorSerialization") {
                      published(message);
                  }
              })) {
        platform::messaging::setTransport(
            [bus = bus_, wrap = std::move(setup.wrapClient)](
                const std::string& name, const platform::messaging::MessageServiceOptions&) {
                auto client = bus->connect(name).get();
                futures::Promise<decltype(client)> promise;
                promise.setValue(wrap ? wrap(std::move(client)) : std::move(client));
                return promise.getFuture();
            });
        bundle_ = std::make_unique<Bundle>(std::forward<Arguments>(arguments)...);
        platform::messaging::setTransport({});  // it is asked once, while the bundle starts
    }

    /// Sends `request` without waiting for what the bundle does.
    void send(const std::string& channel, platform::DataBuffer request) {
        client_->publish(channel, std::move(request)).get();
    }

    /// Sends `request` and waits until the bundle has done with it.
    void sendAndWait(const std::string& channel, std::string_view request) {
        send(channel, platform::DataBuffer::copyOf(request));
        bus_->waitUntilIdle();
    }

    platform::messaging::InProcessBus& bus() { return *bus_; }

private:
    std::shared_ptr<platform::messaging::InProcessBus> bus_;
    std::shared_ptr<platform::messaging::MessageService> client_;
    std::shared_ptr<platform::messaging::Subscription> observation_;
    std::unique_ptr<Bundle> bundle_;
};

}  // namespace test
