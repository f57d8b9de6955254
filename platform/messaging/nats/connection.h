// SPDX-License-Identifier: Apache-2.0
// Connections to NATS servers.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "platform/messaging/nats/handles.h"
#include "platform/messaging/nats/nats_bus.h"

namespace platform::messaging::nats {

/// A connection, which is closed with this object.
class Connection : public std::enable_shared_from_this<Connection> {
public:
    explicit Connection(natsConnection* connection) : connection_(connection) {}
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;
    ~Connection();

    natsConnection* get() const noexcept { return connection_; }

    bool isClosed() const;

    /// True while a server is connected.
    bool isConnected() const;

    /// Owns a subscription on this connection, which it keeps open, and unsubscribes it when it is
    /// destroyed.
    std::shared_ptr<natsSubscription> own(natsSubscription* subscription);

private:
    void release(natsSubscription* subscription);

    natsConnection* const connection_;

    std::mutex mutex_;  // guards what follows
    std::vector<natsSubscription*> released_;
};

// Shared, since a call may go on while another thread gives the connection up.
using ConnectionHandle = std::shared_ptr<Connection>;
using SubscriptionHandle = std::shared_ptr<natsSubscription>;

/// Called on events of connections, on a thread of libnats. Must not throw.
class ConnectionEvents {
public:
    ConnectionEvents() = default;
    ConnectionEvents(const ConnectionEvents&) = delete;
    ConnectionEvents& operator=(const ConnectionEvents&) = delete;
    virtual ~ConnectionEvents() = default;

    /// `reason`: what libnats knows of it.
    virtual void onDisconnected(const std::string& reason) = 0;
    virtual void onReconnected(const std::string& server) = 0;

    /// The connection is given up for good.
    virtual void onClosed(const std::string& reason) = 0;

    /// A server refused something, or messages are dropped. Then `subscription` is the one
    /// affected; it may be gone by now and may only be compared.
    virtual void onError(natsStatus status, const std::string& reason,
                         const natsSubscription* subscription) = 0;
};

/// Connects to one of the servers, waiting for its welcome, and tries each once, or a few times
/// where it refuses the credentials of a file. From then on libnats restores the connection until a
/// server refuses it. `listener`: the number under which the events are registered. Throws
/// NatsError.
ConnectionHandle openConnection(const NatsOptions& options, const std::string& name,
                                std::uintptr_t listener);

/// The server that `connection` is connected to, without what a URL may hold in secrets.
std::string serverOf(natsConnection* connection);

/// The URLs without user names, passwords and tokens, for people to read.
std::string withoutSecrets(const std::vector<std::string>& urls);

/// Registers `events` for the connections that are opened with the number returned, until `forget`.
/// So a late event of a closed connection does no harm.
std::uintptr_t listen(const std::weak_ptr<ConnectionEvents>& events);
void forget(std::uintptr_t listener);

}  // namespace platform::messaging::nats
