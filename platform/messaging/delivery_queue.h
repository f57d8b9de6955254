// SPDX-License-Identifier: Apache-2.0
// A subscription's queue of messages and the threads that hand them to its handler.
#pragma once

#include <cstddef>
#include <memory>

#include "platform/messaging/delivery_threads.h"
#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// Delivers the messages that are pushed to a handler, as DeliveryThreads do: one at a time and in
/// the order pushed when it has one thread, several at once when it has more.
class DeliveryQueue {
public:
    /// Starts `threads` threads, at least one. Throws std::system_error when one cannot be started.
    DeliveryQueue(MessageHandler handler, std::size_t threads);

    DeliveryQueue(const DeliveryQueue&) = delete;
    DeliveryQueue& operator=(const DeliveryQueue&) = delete;

    /// As close().
    ~DeliveryQueue();

    /// Queues `message`, or drops it when the queue is closed. Any thread may call it.
    void push(QueuedMessage message);

    /// Drops what is queued and ends delivery, with the guarantee of DeliveryThreads::close. Must
    /// be called once, or by one thread at a time.
    void close();

private:
    class Messages;

    std::shared_ptr<Messages> messages_;
    DeliveryThreads threads_;
};

}  // namespace platform::messaging
