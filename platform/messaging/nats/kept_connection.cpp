// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/kept_connection.h"

#include <spdlog/logger.h>

#include <algorithm>
#include <exception>
#include <limits>
#include <stdexcept>

#include "platform/messaging/log.h"
#include "platform/messaging/nats/handles.h"
#include "platform/messaging/nats/subject.h"

namespace platform::messaging::nats {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds firstRetryDelay{250};
constexpr std::chrono::milliseconds longestRetryDelay{10'000};

std::chrono::milliseconds nextDelay(std::chrono::milliseconds delay) {
    return std::clamp(2 * delay, firstRetryDelay, longestRetryDelay);
}

// How long a subscription waits for the server to have it, in milliseconds.
constexpr std::int64_t subscribeTimeout = 10'000;

// The length of a message is an int in libnats.
constexpr std::int64_t largestMessage = std::numeric_limits<int>::max();

// Whether trying again may help: no server answered, rather than refused.
bool isUnreachable(natsStatus status) {
    return status == NATS_NO_SERVER || status == NATS_IO_ERROR || status == NATS_TIMEOUT ||
           status == NATS_CONNECTION_CLOSED;
}

// The time left until `deadline`, and at least a millisecond, as libnats wants it.
std::int64_t millisecondsUntil(Clock::time_point deadline) {
    return std::max<std::int64_t>(
        1, std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count());
}

int lengthOf(std::string_view payload) {
    if (std::cmp_greater(payload.size(), largestMessage)) {
        throw std::runtime_error("NATS takes messages of less than 2 GiB.");
    }
    return static_cast<int>(payload.size());
}

}  // namespace

KeptConnection::~KeptConnection() {
    forget(listener_);
    stop();
    if (keeper_.joinable()) {
        keeper_.join();
    }
}

void KeptConnection::connect(const std::string& name) {
    const std::lock_guard lock(connecting_);
    if (isStopping()) {
        throw std::runtime_error(closedText);
    }
    if (!keeper_.joinable()) {
        if (listener_ == 0) {
            listener_ = listen(weak_from_this());
        }
        ConnectionHandle made = connectPatiently(name);
        logger().info("Connected to NATS at {}.", serverOf(made->get()));
        use(made);
        keeper_ = std::thread([this, name] { keepConnected(name); });
    }
}

// Tries until a server is reached, one refuses, or the time is over.
ConnectionHandle KeptConnection::connectPatiently(const std::string& name) {
    const Clock::time_point deadline = Clock::now() + options_.connectTimeout;
    for (auto delay = std::chrono::milliseconds(0); pause(delay); delay = nextDelay(delay)) {
        try {
            return openConnection(options_, name, listener_);
        } catch (const NatsError& error) {
            if (!isUnreachable(error.status()) || Clock::now() + nextDelay(delay) > deadline) {
                throw;
            }
            logger().warn("{} Trying again.", error.what());
        }
    }
    throw std::runtime_error(closedText);
}

// Waits for `delay`; returns false as soon as the bus ends.
bool KeptConnection::pause(std::chrono::milliseconds delay) {
    std::unique_lock lock(mutex_);
    return !changed_.wait_for(lock, delay, [this] { return stopping_; });
}

// The thread that makes another connection whenever libnats has given one up.
void KeptConnection::keepConnected(const std::string& name) {
    for (;;) {
        {
            std::unique_lock lock(mutex_);
            changed_.wait(lock, [this] { return stopping_ || connection_->isClosed(); });
            if (stopping_) {
                return;
            }
        }
        reconnect(name);
    }
}

void KeptConnection::reconnect(const std::string& name) {
    for (auto delay = firstRetryDelay; pause(delay); delay = nextDelay(delay)) {
        try {
            ConnectionHandle made = openConnection(options_, name, listener_);
            const std::string server = serverOf(made->get());
            const std::lock_guard sourcesLock(sourcesMutex_);
            use(made);
            for (const auto& source : sources_) {
                attach(*source);
            }
            disconnected_ = false;
            ++reconnects_;
            logger().warn("Connected to NATS again, at {}.", server);
            return;
        } catch (const std::exception& error) {
            if (!isStopping()) {
                logger().warn("{} Trying again.", error.what());
            }
        }
    }
}

// Puts `made` in place of the connection that there was, unless the bus has ended meanwhile.
void KeptConnection::use(ConnectionHandle& made) {
    const std::lock_guard lock(mutex_);
    if (stopping_) {
        throw std::runtime_error(closedText);
    }
    connection_.swap(made);
}

ConnectionHandle KeptConnection::connection() {
    const std::lock_guard lock(mutex_);
    if (!connection_) {
        throw std::runtime_error(closedText);
    }
    return connection_;
}

// Subscribes on the present connection. If that is just being lost for good, the next one gets the
// subscription.
void KeptConnection::attach(NatsSource& source) {
    try {
        source.attach(connection());
    } catch (const NatsError& error) {
        if (error.status() != NATS_CONNECTION_CLOSED) {
            throw;
        }
    }
}

void KeptConnection::add(const std::shared_ptr<NatsSource>& source) {
    {
        const std::lock_guard lock(sourcesMutex_);
        if (isStopping()) {
            throw std::runtime_error(closedText);
        }
        attach(*source);
        sources_.push_back(source);
    }
    // Others can publish to it only once the server has it. Without a server there is nobody.
    if (isConnected()) {
        natsConnection_FlushTimeout(connection()->get(), subscribeTimeout);
    }
}

void KeptConnection::requirePermitted(const std::string& channel) {
    const char* reason = nullptr;
    // The connection overwrites its text with each error, such as those of a reconnection: so it is
    // read only after a refusal.
    if (natsConnection_GetLastError(connection()->get(), &reason) != NATS_NOT_PERMITTED) {
        return;
    }
    if (std::string_view(reason).find("Subscription to \"" + channel + "\"") !=
        std::string_view::npos) {
        throw std::runtime_error(reason);
    }
}

void KeptConnection::remove(const std::shared_ptr<NatsSource>& source) {
    const std::lock_guard lock(sourcesMutex_);
    std::erase(sources_, source);
}

void KeptConnection::publish(const std::string& channel, std::string_view payload) {
    requireSubject(channel);
    const ConnectionHandle connection = this->connection();
    requireSent(natsConnection_Publish(connection->get(), channel.c_str(), payload.data(),
                                       lengthOf(payload)),
                *connection);
}

void KeptConnection::publish(const std::string& channel, const char* key, const std::string& value,
                             std::string_view payload) {
    requireSubject(channel);
    const ConnectionHandle connection = this->connection();
    natsMsg* made = nullptr;
    check(natsMsg_Create(&made, channel.c_str(), nullptr, payload.data(), lengthOf(payload)),
          "The message could not be made");
    const ReceivedMessage message(made);
    check(natsMsgHeader_Set(made, key, value.c_str()), "The message could not be made");
    requireSent(natsConnection_PublishMsg(connection->get(), made), *connection);
}

void KeptConnection::requireSent(natsStatus status, const Connection& connection) {
    if (status == NATS_MAX_PAYLOAD) {
        throw std::runtime_error("The server takes messages of up to " +
                                 std::to_string(natsConnection_GetMaxPayload(connection.get())) +
                                 " bytes.");
    }
    if (status == NATS_INSUFFICIENT_BUFFER) {
        throw std::runtime_error("No server is connected, and no more messages can wait for one.");
    }
    if (status == NATS_TIMEOUT) {
        // The server has a part of the message and would take what comes next for the rest.
        natsConnection_Close(connection.get());
    }
    check(status, "The message could not be sent");
    // Not read from libnats, since the threads that send and receive contend for its lock.
    if (disconnected_) {
        unsent_ = true;
    }
}

std::size_t KeptConnection::maxPayload() {
    ConnectionHandle connection;
    {
        const std::lock_guard lock(mutex_);
        connection = connection_;
    }
    // Read each time: another server, or this one with another configuration, may differ.
    const std::int64_t limit = connection ? natsConnection_GetMaxPayload(connection->get()) : 0;
    // Zero until a server has reported it.
    return static_cast<std::size_t>(limit > 0 ? std::min(limit, largestMessage) : largestMessage);
}

bool KeptConnection::isStopping() {
    const std::lock_guard lock(mutex_);
    return stopping_;
}

bool KeptConnection::isConnected() {
    const std::lock_guard lock(mutex_);
    return connection_ && connection_->isConnected();
}

void KeptConnection::stop() {
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_all();
}

std::vector<std::shared_ptr<NatsSource>> KeptConnection::sources() {
    const std::lock_guard lock(sourcesMutex_);
    return sources_;
}

bool KeptConnection::close(Clock::time_point deadline) {
    ConnectionHandle connection;
    {
        const std::lock_guard lock(mutex_);
        connection.swap(connection_);
    }
    if (!connection) {
        return true;
    }
    const bool sent = flush(*connection, deadline);
    natsConnection_Close(connection->get());
    return sent;
}

// Waits until the server has what was published.
bool KeptConnection::flush(const Connection& connection, Clock::time_point deadline) {
    if (!connection.isConnected() && !unsent_) {
        return true;
    }
    return natsConnection_FlushTimeout(connection.get(), millisecondsUntil(deadline)) == NATS_OK;
}

void KeptConnection::onDisconnected(const std::string& reason) {
    disconnected_ = true;
    if (!isStopping()) {
        logger().warn("The connection to NATS is lost: {}.", reason);
    }
}

void KeptConnection::onReconnected(const std::string& server) {
    disconnected_ = false;
    unsent_ = false;
    ++reconnects_;
    logger().warn("Connected to NATS again, at {}.", server);
}

void KeptConnection::onClosed(const std::string& reason) {
    // isStopping locks the mutex, so by now the keeper either has seen that the connection is
    // closed, or waits and is woken.
    if (!isStopping()) {
        logger().warn("NATS has ended the connection: {}.", reason);
    }
    changed_.notify_all();
}

void KeptConnection::onError(natsStatus status, const std::string& reason,
                             const natsSubscription* subscription) {
    if (status != NATS_SLOW_CONSUMER) {
        logger().error("NATS reports: {}.", reason);
        return;
    }
    const std::lock_guard lock(sourcesMutex_);
    for (const auto& source : sources_) {
        if (source->reportDropped(subscription)) {
            return;
        }
    }
}

}  // namespace platform::messaging::nats
