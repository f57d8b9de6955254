// SPDX-License-Identifier: Apache-2.0
// The delivery threads take turns: one waits in libnats while others run the handler or queue up
// after it. A message thus wakes one thread, the one that handles it.
#include "platform/messaging/nats/nats_source.h"

#include <spdlog/logger.h>

#include <algorithm>
#include <limits>
#include <string_view>
#include <utility>

#include "platform/messaging/log.h"
#include "platform/messaging/nats/handles.h"
#include "platform/text/quoted.h"

namespace platform::messaging::nats {
namespace {

// libnats wants some time limit.
constexpr std::int64_t oneHourInMilliseconds = 3'600'000;

// `bound` as the library takes limits.
int asLimit(std::size_t bound) {
    return static_cast<int>(std::clamp<std::size_t>(bound, 1, std::numeric_limits<int>::max()));
}

}  // namespace

QueuedMessage makeMessage(const std::shared_ptr<const std::string>& channel,
                          ReceivedMessage received, std::shared_ptr<const void> companion) {
    const std::string_view payload(natsMsg_GetData(received.get()),
                                   static_cast<std::size_t>(natsMsg_GetDataLength(received.get())));
    std::shared_ptr<const void> owner(
        received.release(),
        [companion = std::move(companion)](natsMsg* message) { Destroy()(message); });
    return {JsonMessage(channel, payload, std::move(owner)), nullptr, nullptr};
}

NatsSource::NatsSource(const std::string& channel, std::string queueGroup,
                       std::size_t maxPendingMessages, std::size_t maxPendingBytes,
                       std::size_t threads, Receive receive)
    : channel_(std::make_shared<const std::string>(channel)),
      queueGroup_(std::move(queueGroup)),
      maxPendingMessages_(asLimit(maxPendingMessages)),
      maxPendingBytes_(asLimit(maxPendingBytes)),
      threads_(threads),
      receive_(std::move(receive)) {}

void NatsSource::attach(const ConnectionHandle& connection) {
    natsSubscription* made = nullptr;
    check(queueGroup_.empty()
              ? natsConnection_SubscribeSync(&made, connection->get(), channel_->c_str())
              : natsConnection_QueueSubscribeSync(&made, connection->get(), channel_->c_str(),
                                                  queueGroup_.c_str()),
          "Cannot subscribe channel \"" + text::printable(*channel_) + "\"");
    SubscriptionHandle subscription = connection->own(made);
    natsSubscription_SetPendingLimits(made, maxPendingMessages_, maxPendingBytes_);
    {
        const std::lock_guard lock(mutex_);
        if (!finishing_) {
            subscription_.swap(subscription);
            loggedDrops_ = 0;
        }
    }
    changed_.notify_all();
}

std::optional<QueuedMessage> NatsSource::next() {
    const std::lock_guard turn(taking_);
    while (const SubscriptionHandle subscription = waitForSubscription()) {
        natsMsg* message = nullptr;
        switch (natsSubscription_NextMsg(&message, subscription.get(), oneHourInMilliseconds)) {
            case NATS_OK:
                if (std::optional<QueuedMessage> made = receive_(ReceivedMessage(message))) {
                    return made;
                }
                break;
            case NATS_TIMEOUT:
            case NATS_NO_RESPONDERS:  // a message that says no more than that
                break;
            case NATS_SLOW_CONSUMER:
                reportDropped(subscription.get());
                break;
            default:  // it ended, or was drained, or its connection is closed
                detach(subscription);
        }
    }
    return std::nullopt;
}

SubscriptionHandle NatsSource::waitForSubscription() {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return subscription_ || finishing_; });
    if (!subscription_) {
        ++finishedThreads_;
        changed_.notify_all();
    }
    return subscription_;
}

void NatsSource::detach(const SubscriptionHandle& subscription) {
    const std::lock_guard lock(mutex_);
    if (subscription_ == subscription) {
        subscription_.reset();
    }
}

void NatsSource::end() {
    SubscriptionHandle subscription;  // released without the mutex
    {
        const std::lock_guard lock(mutex_);
        finishing_ = true;
        logDropped(std::chrono::seconds(0));
        subscription.swap(subscription_);
    }
    changed_.notify_all();
    if (subscription) {
        natsSubscription_Unsubscribe(subscription.get());
    }
}

void NatsSource::drain(bool connected) {
    SubscriptionHandle subscription;
    {
        const std::lock_guard lock(mutex_);
        finishing_ = true;
        logDropped(std::chrono::seconds(0));
        subscription = subscription_;
    }
    changed_.notify_all();
    if (!subscription) {
        return;
    }
    // Draining asks the server, which takes seconds to fail when there is none.
    int waiting = 0;
    if (!connected &&
        (natsSubscription_GetPending(subscription.get(), &waiting, nullptr) != NATS_OK ||
         waiting == 0)) {
        natsSubscription_Unsubscribe(subscription.get());
    } else {
        // Without libnats' own time limit, after which it would drop messages.
        natsSubscription_DrainTimeout(subscription.get(), -1);
    }
}

bool NatsSource::waitUntilDrained(std::chrono::steady_clock::time_point deadline) {
    std::unique_lock lock(mutex_);
    return changed_.wait_until(lock, deadline, [this] { return finishedThreads_ == threads_; });
}

NatsBacklog NatsSource::backlog() {
    const std::lock_guard lock(mutex_);
    int messages = 0;
    int bytes = 0;
    std::int64_t dropped = 0;
    if (!subscription_ ||
        natsSubscription_GetPending(subscription_.get(), &messages, &bytes) != NATS_OK ||
        natsSubscription_GetDropped(subscription_.get(), &dropped) != NATS_OK) {
        return {};
    }
    return {static_cast<std::uint64_t>(messages), static_cast<std::uint64_t>(bytes),
            static_cast<std::uint64_t>(dropped)};
}

bool NatsSource::reportDropped(const natsSubscription* subscription) {
    const std::lock_guard lock(mutex_);
    if (subscription_.get() != subscription) {
        return false;
    }
    logDropped(std::chrono::seconds(1));  // a flood of messages must not become one of log lines
    return true;
}

// The mutex is held.
void NatsSource::logDropped(std::chrono::steady_clock::duration minimalGap) {
    std::int64_t dropped = 0;
    const auto now = std::chrono::steady_clock::now();
    if (natsSubscription_GetDropped(subscription_.get(), &dropped) != NATS_OK ||
        dropped == loggedDrops_ || now < lastDropLog_ + minimalGap) {
        return;
    }
    loggedDrops_ = dropped;
    lastDropLog_ = now;
    logger().error(
        "Slow consumer: the messages on channel \"{}\" come faster than they are handled, and {} "
        "of them or {} bytes may wait; {} messages have been dropped so far.",
        text::printable(*channel_), maxPendingMessages_, maxPendingBytes_, dropped);
}

}  // namespace platform::messaging::nats
