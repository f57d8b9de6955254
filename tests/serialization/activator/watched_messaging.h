// SPDX-License-Identifier: Apache-2.0
// The message service as the bundle gets it in a test: clients of an in-process bus whose
// subscriptions are written down, and fail or take their time where a test says so.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "futures/future.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/transport.h"

namespace test {

class WatchedMessaging {
public:
    using MessageService = platform::messaging::MessageService;
    using Subscription = platform::messaging::Subscription;
    using Created = futures::Future<std::shared_ptr<MessageService>>;
    using Subscribed = futures::Future<std::shared_ptr<Subscription>>;

    /// Is the transport of the process while it lives.
    WatchedMessaging();
    WatchedMessaging(const WatchedMessaging&) = delete;
    WatchedMessaging& operator=(const WatchedMessaging&) = delete;
    ~WatchedMessaging();

    /// What createMessageService does from now on, in place of connecting to the bus.
    void createWith(platform::messaging::Transport create);

    /// What subscribing `channel` does from now on, given the future of the bus's own subscription.
    void subscribeWith(const std::string& channel, std::function<Subscribed(Subscribed)> subscribe);

    /// A client that is connected to the bus and watched.
    std::shared_ptr<MessageService> connect(const std::string& clientName);

    /// Publishes `payload` on `channel` and waits until all that follows from it is done. Returns
    /// the messages that the bundle published meanwhile, each as its channel, a space and its text.
    std::vector<std::string> publish(const std::string& channel, const std::string& payload);

    /// What the bundle has done: "client 1", "/a for client 1" for a subscription of its, and "end
    /// of" before either of them.
    std::vector<std::string> events() const;

private:
    struct State;
    class WatchedClient;
    class WatchedSubscription;

    const std::shared_ptr<State> state_;
};

}  // namespace test
