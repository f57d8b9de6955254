// SPDX-License-Identifier: Apache-2.0
// The message service that a host offers its bundles: channels of byte messages, one client per
// user.
//
// A host with a messaging library of its own puts it behind this interface; ours is an in-process
// bus (in_process_bus.h).
#pragma once

#include <cstddef>
#include <functional>
#include <limits>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>

#include "futures/future.h"
#include "platform/data_buffer.h"

namespace platform::messaging {

/// One delivered message. Copies share the payload.
class JsonMessage {
public:
    JsonMessage(std::shared_ptr<const std::string> channel,
                std::shared_ptr<const DataBuffer> payload)
        : channel_(std::move(channel)), payload_(payload->view()), owner_(std::move(payload)) {}

    /// A message of bytes that are valid as long as `owner` lives.
    JsonMessage(std::shared_ptr<const std::string> channel, std::string_view payload,
                std::shared_ptr<const void> owner)
        : channel_(std::move(channel)), payload_(payload), owner_(std::move(owner)) {}

    /// The channel on which the message was published.
    std::string_view channel() const noexcept { return *channel_; }

    /// The message's bytes. Valid as long as a copy of the message lives.
    std::string_view payload() const noexcept { return payload_; }

private:
    std::shared_ptr<const std::string> channel_;
    std::string_view payload_;
    std::shared_ptr<const void> owner_;
};

using MessageHandler = std::function<void(const JsonMessage&)>;

/// The handle of a subscription, which lasts while it is held. When its destruction returns, the
/// handler is not running and will not run again, except when it is destroyed by that handler
/// itself.
class Subscription {
public:
    Subscription() = default;
    Subscription(const Subscription&) = delete;
    Subscription& operator=(const Subscription&) = delete;
    virtual ~Subscription() = default;
};

/// A client of the bus. Its operations may be called from any thread.
class MessageService {
public:
    MessageService() = default;
    MessageService(const MessageService&) = delete;
    MessageService& operator=(const MessageService&) = delete;
    virtual ~MessageService() = default;

    /// Calls `handler` for every message that is published on `channel` once the future has
    /// resolved: on the bus's own threads, one at a time and in order unless the channel is set to
    /// concurrent delivery. An exception that leaves the handler is logged with the channel and
    /// dropped.
    virtual futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                                     MessageHandler handler) = 0;

    /// Sends `payload` to the subscribers of `channel`, taking the buffer over. The future resolves
    /// when the bus has accepted the message, or holds an exception when it has not.
    virtual futures::Future<void> publish(const std::string& channel, DataBuffer payload) = 0;

    /// The length, in bytes, of the longest payload that can be published on `channel` now: a
    /// caller may stop building a message that gets longer. Services without such a limit need not
    /// override this.
    virtual std::size_t maxPayload([[maybe_unused]] const std::string& channel) const {
        return std::numeric_limits<std::size_t>::max();
    }

    /// Waits until `bytes` bytes of memory are free for the calling handler, and reserves them
    /// until it returns or calls this again. To be called before a large document is read; services
    /// that do not limit memory need not override this.
    virtual void awaitMemory([[maybe_unused]] std::size_t bytes) {}
};

/// Options of a client, by name. None are defined for the in-process bus.
using MessageServiceOptions = std::unordered_map<std::string, std::string>;

/// Creates the client `clientName` on the transport that the host has chosen.
[[gnu::visibility("default")]] futures::Future<std::shared_ptr<MessageService>>
createMessageService(const std::string& clientName, const MessageServiceOptions& options);

}  // namespace platform::messaging
