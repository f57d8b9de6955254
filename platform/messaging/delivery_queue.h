// A subscription's queue of messages and the threads that hand them to its handler.
#pragma once

#include <cstddef>
#include <memory>
#include <thread>
#include <vector>

#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// A message in a queue, with what its sender wants to have released along the way.
struct QueuedMessage {
    JsonMessage message;

    /// Released when the message leaves the queue.
    std::shared_ptr<const void> whileQueued;

    /// Released when its handler is done with the message, or the message is dropped.
    std::shared_ptr<const void> untilDone;
};

/// Delivers messages to a handler: one at a time and in the order pushed when it has one thread,
/// several at once when it has more. What the handler throws is logged with the channel, and
/// dropped.
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

    /// Drops what is queued and ends delivery. When it returns, the handler is not running, on any
    /// thread, and has been destroyed; when the handler itself calls it, that one call goes on, and
    /// the handler is destroyed after it. To be called once, or by one thread at a time.
    void close();

private:
    struct State;

    static void deliver(State& state);

    // The threads share it, since the one that closes the queue from inside the handler outlives
    // it.
    std::shared_ptr<State> state_;
    std::vector<std::thread> threads_;
};

}  // namespace platform::messaging
