// SPDX-License-Identifier: Apache-2.0
// The message bus across processes: channels are subjects of NATS servers.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "futures/future.h"
#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// Messages that travel in pieces, between this bus and clients that say that they can
/// (docs/protocol.md).
struct LongMessageOptions {
    /// The channels of requests, each with what precedes a request's id in the channel of its
    /// answer. Empty: no message is long.
    std::map<std::string, std::string> answerPrefixes;

    /// The longest message.
    std::size_t maxMessage = std::size_t{1} << 30;

    /// Bounds on the bytes that are held at once: of requests until they are handled, and of
    /// answers until their clients have taken them.
    std::size_t maxIncomingBytes = std::size_t{2} << 30;
    std::size_t maxOutgoingBytes = std::size_t{2} << 30;
};

/// The servers of a bus, its credentials for them, and how it delivers.
struct NatsOptions {
    /// URLs, such as "nats://127.0.0.1:4222"; tried in random order. One that begins with "tls://"
    /// turns TLS on. Other servers of the cluster are learned from those that are reached.
    std::vector<std::string> servers;

    /// What the servers ask for; empty: not used. The file holds a user's JWT and seed.
    std::string credentialsFile;
    std::string token;
    std::string user;
    std::string password;

    struct Tls {
        bool enabled = false;

        /// PEM files. Without a file of authorities, the system's are trusted; certificate and key
        /// are this client's own, for servers that ask for them.
        std::string caFile;
        std::string certificateFile;
        std::string keyFile;
    };
    Tls tls;

    /// How long the first `connect` goes on trying when no server can be reached; zero: each server
    /// is tried once.
    std::chrono::milliseconds connectTimeout{0};

    /// The queue group that subscriptions on `queueChannels` join, so that each message goes to one
    /// member of the group; empty: none.
    std::string queueGroup;
    std::vector<std::string> queueChannels;

    /// Channels whose messages come over a connection of their own, so that others do not queue
    /// behind them at the servers.
    std::vector<std::string> separateChannels;

    /// As those of InProcessBusOptions.
    std::vector<std::string> concurrentChannels;
    std::size_t concurrency = 0;

    /// Bounds on the messages and on their payload bytes that wait in the process for the handler
    /// of one subscription. A message beyond one of them is dropped, which is logged. The bound on
    /// messages also limits how long a flood of small ones delays the others.
    std::size_t maxPendingMessages = 8192;
    std::size_t maxPendingBytes = std::size_t{256} << 20;

    /// Bound on the bytes that are published while no server is reached, and sent when one is. The
    /// message that exceeds it is still taken.
    std::size_t maxUnsentBytes = std::size_t{64} << 20;

    LongMessageOptions longMessages;
};

/// Messages of a NatsBus that wait, and those that it had no room for.
struct NatsBacklog {
    std::uint64_t messages = 0;
    std::uint64_t bytes = 0;
    std::uint64_t dropped = 0;
};

/// A bus over NATS servers: channels are subjects, verbatim. Messages are delivered at most once.
///
/// Each subscription has threads of its own, which are started by `subscribe`; all other threads
/// come from the first `connect`. The futures of the operations are resolved when they are
/// returned.
///
/// When the connection is lost, another is made to the same server or the next one, for as long as
/// it takes, and the subscriptions are made again. A publish future holds an exception when the
/// channel is not a valid subject (white space, empty), when the message is larger than the server
/// takes and its receiver does not take pieces, and when it cannot be sent; it does not say whether
/// anyone received the message.
///
/// Losses of the connection, dropped messages, messages that were not published and failures of
/// handlers are logged to spdlog's logger "messaging", as by InProcessBus.
class [[gnu::visibility("default")]] NatsBus {
public:
    /// A bus that is not connected yet. Does not touch the network.
    static std::shared_ptr<NatsBus> create(NatsOptions options);

    NatsBus(const NatsBus&) = delete;
    NatsBus& operator=(const NatsBus&) = delete;

    /// Clients and subscriptions keep working.
    ~NatsBus();

    /// A client of the bus. The first call connects to a server, under the name `clientName`;
    /// later clients share its connections. The future holds an exception when no server can be
    /// reached, or one refuses the connection.
    futures::Future<std::shared_ptr<MessageService>> connect(const std::string& clientName);

    /// True while all connections are made.
    bool isConnected() const;

    /// How many times a lost connection has been replaced since the first `connect`.
    std::uint64_t reconnects() const;

    /// What has come and waits to be handled, over all subscriptions, and how many messages the
    /// subscriptions have dropped because too much waited. It restarts with each connection.
    NatsBacklog backlog() const;

    /// Shuts the bus down gracefully: unsubscribes at the server, lets the handlers finish the
    /// messages that were taken, sends what they published, and closes the connection. Returns
    /// false when that takes longer than `timeout`; what is left is then abandoned. From then on
    /// every operation fails. Also ends a `connect` that is still trying. Must not be called from a
    /// handler.
    bool drain(std::chrono::milliseconds timeout);

private:
    class [[gnu::visibility("hidden")]] Core;
    [[gnu::visibility("hidden")]] explicit NatsBus(std::shared_ptr<Core> core);

    std::shared_ptr<Core> core_;
};

}  // namespace platform::messaging
