// SPDX-License-Identifier: Apache-2.0
// A connection to NATS servers that is made again whenever it is lost, with its subscriptions.
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/data_buffer.h"
#include "platform/messaging/nats/connection.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/nats/nats_source.h"

namespace platform::messaging::nats {

/// The text of exceptions for a bus that has been closed.
inline constexpr const char* closedText = "The message bus has been closed.";

/// libnats restores a connection that breaks; when a server refuses it, libnats gives up, and a
/// thread of this object makes a new one. Any thread may call the operations.
class KeptConnection final : public ConnectionEvents,
                             public std::enable_shared_from_this<KeptConnection> {
public:
    explicit KeptConnection(NatsOptions options) : options_(std::move(options)) {}
    ~KeptConnection() override;

    /// Connects for the first time; later calls do nothing. Tries until a server is reached, one
    /// refuses, or the time of the options is over. Throws NatsError, or std::runtime_error when
    /// the connection has been stopped.
    void connect(const std::string& name);

    /// Subscribes `source`, now and on every connection to come, until `remove`.
    void add(const std::shared_ptr<NatsSource>& source);
    void remove(const std::shared_ptr<NatsSource>& source);

    /// Throws std::runtime_error with the reason if the server has refused a source of `channel`
    /// that was added. It does so before it answers the flush with which `add` ends.
    void requirePermitted(const std::string& channel);

    /// Sends a message without a header. Throws std::runtime_error with the reason when it cannot
    /// be sent, which holds also for a channel that is not a subject.
    void publish(const std::string& channel, std::string_view payload);

    /// Sends a message with the header `key`.
    void publish(const std::string& channel, const char* key, const std::string& value,
                 std::string_view payload);

    /// The longest payload that the server takes; what libnats does while there is no server.
    std::size_t maxPayload();

    /// True while a server is connected.
    bool isConnected();

    /// How many times a lost connection has been replaced.
    std::uint64_t reconnects() const noexcept { return reconnects_; }

    /// Makes no more connections and takes no more sources. Those that exist go on.
    void stop();

    bool isStopping();

    /// The sources that have been added.
    std::vector<std::shared_ptr<NatsSource>> sources();

    /// Sends what has been published, and closes the connection. Returns false when the server has
    /// not received all of it by `deadline`.
    bool close(std::chrono::steady_clock::time_point deadline);

    void onDisconnected(const std::string& reason) override;
    void onReconnected(const std::string& server) override;
    void onClosed(const std::string& reason) override;
    void onError(natsStatus status, const std::string& reason,
                 const natsSubscription* subscription) override;

private:
    ConnectionHandle connectPatiently(const std::string& name);
    void keepConnected(const std::string& name);
    void reconnect(const std::string& name);
    bool pause(std::chrono::milliseconds delay);
    void use(ConnectionHandle& made);
    ConnectionHandle connection();
    void attach(NatsSource& source);
    void requireSent(natsStatus status, const Connection& connection);
    bool flush(const Connection& connection, std::chrono::steady_clock::time_point deadline);

    const NatsOptions options_;

    std::mutex connecting_;  // held while the first connection is made, and guards these two
    std::uintptr_t listener_ = 0;
    std::thread keeper_;

    // Whether libnats holds messages until there is a server again.
    std::atomic<bool> unsent_ = false;
    std::atomic<bool> disconnected_ = false;
    std::atomic<std::uint64_t> reconnects_ = 0;

    std::mutex sourcesMutex_;  // guards what follows; locked before mutex_
    std::vector<std::shared_ptr<NatsSource>> sources_;

    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    ConnectionHandle connection_;  // none before the first and after closing
    bool stopping_ = false;
};

}  // namespace platform::messaging::nats
