// SPDX-License-Identifier: Apache-2.0
// The message bus within one process: it carries messages between the clients that connect to it.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "futures/future.h"
#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// The limits of a bus, and how it delivers.
struct InProcessBusOptions {
    /// Bound on the payload bytes that wait in queues, over the whole bus.
    std::size_t maxQueuedBytes = std::size_t{1} << 30;

    /// Channels whose subscriptions may run their handler several times at once, in any order.
    std::vector<std::string> concurrentChannels;

    /// Threads of a subscription on a concurrent channel; 0: as many as there are processors, at
    /// least two.
    std::size_t concurrency = 0;
};

/// Is called with a message and the client that published it; the name is valid during the call.
using MessageObserver = std::function<void(std::string_view clientName, const JsonMessage&)>;

/// An in-process bus. Every subscription has a queue and threads of its own, so a slow handler does
/// not delay other subscriptions. Payloads are never copied; the subscribers of a channel share
/// them.
///
/// The futures of its clients' operations are resolved when they are returned. A publish future
/// holds an exception when the message would take the waiting bytes past their bound.
///
/// The operations may be called from any thread, handlers and observers included (but see
/// `waitUntilIdle`). Clients and subscriptions keep working after this object is gone.
///
/// Failures of handlers and observers are logged to spdlog's logger "messaging", which writes to
/// standard error and follows spdlog's global level; a logger of that name that exists already is
/// used.
class [[gnu::visibility("default")]] InProcessBus {
public:
    /// A bus without clients. It starts no thread before the first subscription.
    static std::shared_ptr<InProcessBus> create(InProcessBusOptions options = {});

    InProcessBus(const InProcessBus&) = delete;
    InProcessBus& operator=(const InProcessBus&) = delete;
    ~InProcessBus();

    /// A client that is known to observers as `clientName`. Names need not differ.
    futures::Future<std::shared_ptr<MessageService>> connect(const std::string& clientName);

    /// Calls `observer` for every message that the bus accepts, on the publishing thread, before
    /// the message is delivered and before `publish` returns: a slow observer slows the publisher
    /// down. Several threads may call it at once. It lasts as long as the returned handle, with the
    /// guarantee that `Subscription` gives.
    [[nodiscard]] std::shared_ptr<Subscription> observe(MessageObserver observer);

    /// Blocks until every message that was accepted, also those that handlers publish, has been
    /// handled or dropped with its subscription. Must not be called from a handler or an observer,
    /// which it would wait for.
    void waitUntilIdle();

    /// Blocks until no more than `messages` messages wait in queues, and their payloads have no
    /// more than `bytes` bytes together: with it a publisher that is faster than the handlers slows
    /// down before its messages are refused. A message that several queues hold counts once. Must
    /// not be called from a handler or an observer.
    void waitUntilQueuedAtMost(std::size_t messages, std::size_t bytes);

    /// Payload bytes of the messages that wait in queues. A message that several queues hold counts
    /// once.
    std::size_t queuedBytes() const;

private:
    class [[gnu::visibility("hidden")]] Core;
    [[gnu::visibility("hidden")]] explicit InProcessBus(std::shared_ptr<Core> core);

    std::shared_ptr<Core> core_;
};

}  // namespace platform::messaging
