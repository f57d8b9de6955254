// SPDX-License-Identifier: Apache-2.0
// A subscription at a NATS server, as the source of its delivery threads.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "platform/messaging/delivery_threads.h"
#include "platform/messaging/nats/connection.h"
#include "platform/messaging/nats/handles.h"
#include "platform/messaging/nats/nats_bus.h"

namespace platform::messaging::nats {

using ReceivedMessage = std::unique_ptr<natsMsg, Destroy>;

/// Makes a message of what a server has sent; none when the handler must not get it.
using Receive = std::function<std::optional<QueuedMessage>(ReceivedMessage)>;

/// A message of all that `received` holds, which also keeps `companion`.
QueuedMessage makeMessage(const std::shared_ptr<const std::string>& channel,
                          ReceivedMessage received, std::shared_ptr<const void> companion);

/// Takes the messages of a channel straight from libnats, on the delivery threads themselves. It
/// outlives connections: each new one is made known with `attach`.
class NatsSource final : public MessageSource {
public:
    /// `threads`: how many threads call `next`. `receive` is called by one of them at a time.
    NatsSource(const std::string& channel, std::string queueGroup, std::size_t maxPendingMessages,
               std::size_t maxPendingBytes, std::size_t threads, Receive receive);

    /// Subscribes on `connection`, in place of an earlier one that is closed. Nothing happens after
    /// `end` or `drain`. Throws NatsError.
    void attach(const ConnectionHandle& connection);

    std::optional<QueuedMessage> next() override;
    void end() override;

    /// Unsubscribes at the server; `next` returns none once the messages that were taken are
    /// delivered. Does not wait.
    void drain(bool connected);

    /// Waits until all threads have learned that there are no more messages, and so have handled
    /// theirs. Returns false when `deadline` comes first.
    bool waitUntilDrained(std::chrono::steady_clock::time_point deadline);

    /// What waits, and what was dropped, since the present connection was made.
    NatsBacklog backlog();

    /// Logs that messages were dropped when `subscription` is this source's; returns whether it is.
    bool reportDropped(const natsSubscription* subscription);

private:
    SubscriptionHandle waitForSubscription();
    void detach(const SubscriptionHandle& subscription);
    void logDropped(std::chrono::steady_clock::duration minimalGap);

    const std::shared_ptr<const std::string> channel_;
    const std::string queueGroup_;
    const int maxPendingMessages_;
    const int maxPendingBytes_;
    const std::size_t threads_;
    const Receive receive_;

    std::mutex taking_;  // held by the one thread that waits for a message

    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    SubscriptionHandle subscription_;  // none between connections and after the end
    bool finishing_ = false;           // no other subscription will come
    std::size_t finishedThreads_ = 0;
    std::int64_t loggedDrops_ = 0;  // of the present subscription
    std::chrono::steady_clock::time_point lastDropLog_;
};

}  // namespace platform::messaging::nats
