// SPDX-License-Identifier: Apache-2.0
// The threads of a subscription, which hand its messages to the handler.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// A message on its way to a handler, with what its sender wants released on the way.
struct QueuedMessage {
    JsonMessage message;

    /// Released when a delivery thread has taken the message.
    std::shared_ptr<const void> whileQueued;

    /// Released when its handler is done with the message, or the message is dropped.
    std::shared_ptr<const void> untilDone;
};

/// Where delivery threads get their messages from.
class MessageSource {
public:
    MessageSource() = default;
    MessageSource(const MessageSource&) = delete;
    MessageSource& operator=(const MessageSource&) = delete;
    virtual ~MessageSource() = default;

    /// Waits for the next message; none when there will be no more. Called by several threads at
    /// once when a subscription has several. When it throws, for lack of memory, that message is
    /// lost, which is logged, and the next one is asked for.
    virtual std::optional<QueuedMessage> next() = 0;

    /// Drops what waits, and has `next` return none from now on.
    virtual void end() = 0;
};

/// Gives the messages of a source to a handler: one at a time and in the source's order when there
/// is one thread, several at once when there are more. Exceptions of the handler are logged with
/// the channel, and dropped.
class DeliveryThreads {
public:
    /// Starts `count` threads, at least one. Throws std::system_error when one cannot be started.
    DeliveryThreads(MessageHandler handler, std::shared_ptr<MessageSource> source,
                    std::size_t count);

    DeliveryThreads(const DeliveryThreads&) = delete;
    DeliveryThreads& operator=(const DeliveryThreads&) = delete;

    /// As close().
    ~DeliveryThreads();

    /// Ends the source and delivery. When it returns, the handler is not running, on any thread,
    /// and has been destroyed; when the handler itself calls it, that one call goes on, and the
    /// handler is destroyed after it. Must be called once, or by one thread at a time.
    void close();

private:
    struct State;

    static void deliver(State& state);

    // The threads share it, since a thread that closes it from inside the handler outlives this
    // object.
    std::shared_ptr<State> state_;
    std::vector<std::thread> threads_;
    bool closed_ = false;
};

/// How many delivery threads a subscription on `channel` gets: one, or on one of the
/// `concurrentChannels` `concurrency`, where 0 means as many as the hardware's, at least two.
std::size_t deliveryThreadCount(const std::string& channel,
                                const std::vector<std::string>& concurrentChannels,
                                std::size_t concurrency);

}  // namespace platform::messaging
