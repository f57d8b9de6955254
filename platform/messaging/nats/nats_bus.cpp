// SPDX-License-Identifier: Apache-2.0
// The core holds the connection, which clients and subscriptions share. libnats restores a
// connection that breaks; when a server turns it away, libnats gives it up, and a thread of the
// core makes a new one.
#include "platform/messaging/nats/nats_bus.h"

#include <spdlog/logger.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <exception>
#include <limits>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <utility>

#include "platform/messaging/log.h"
#include "platform/messaging/nats/connection.h"
#include "platform/messaging/nats/handles.h"
#include "platform/messaging/nats/nats_source.h"
#include "platform/messaging/nats/subject.h"
#include "platform/messaging/resolved.h"

namespace platform::messaging {
namespace {

using Clock = std::chrono::steady_clock;
using nats::ConnectionHandle;
using nats::NatsError;
using nats::NatsSource;
using nats::printable;

constexpr const char* closedText = "The message bus has been closed.";

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

// What is left until `deadline`, and at least a millisecond, as libnats wants it.
std::int64_t millisecondsUntil(Clock::time_point deadline) {
    return std::max<std::int64_t>(
        1, std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count());
}

bool contains(const std::vector<std::string>& list, const std::string& text) {
    return std::find(list.begin(), list.end(), text) != list.end();
}

}  // namespace

class NatsBus::Core final : public nats::ConnectionEvents,
                            public std::enable_shared_from_this<Core> {
public:
    explicit Core(NatsOptions options) : options_(std::move(options)) {}
    ~Core() override;

    std::shared_ptr<MessageService> connect(const std::string& clientName);
    std::shared_ptr<Subscription> subscribe(const std::string& channel, MessageHandler handler);
    void publish(const std::string& channel, const DataBuffer& payload);
    std::size_t maxPayload();
    bool isConnected();
    bool drain(std::chrono::milliseconds timeout);

    void onDisconnected(const std::string& reason) override;
    void onReconnected(const std::string& server) override;
    void onClosed(const std::string& reason) override;
    void onError(natsStatus status, const std::string& reason,
                 const natsSubscription* subscription) override;

private:
    class Client;
    class ChannelSubscription;

    ConnectionHandle connectPatiently(const std::string& name);
    void keepConnected(const std::string& name);
    void reconnect(const std::string& name);
    bool pause(std::chrono::milliseconds delay);
    void use(ConnectionHandle& made);
    ConnectionHandle connection();
    void attach(NatsSource& source);
    void send(const std::string& channel, const DataBuffer& payload);
    bool flush(const nats::Connection& connection, Clock::time_point deadline);
    bool isStopping();

    const NatsOptions options_;

    std::mutex connecting_;  // held while the first connection is made, and guards these two
    std::uintptr_t listener_ = 0;
    std::thread keeper_;

    // Whether libnats holds messages until there is a server again.
    std::atomic<bool> unsent_ = false;
    std::atomic<bool> disconnected_ = false;

    std::mutex sourcesMutex_;  // guards what follows; locked before mutex_
    std::vector<std::shared_ptr<NatsSource>> sources_;

    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    ConnectionHandle connection_;  // none before the first, and when the bus has been closed
    bool stopping_ = false;
};

class NatsBus::Core::ChannelSubscription final : public Subscription {
public:
    ChannelSubscription(std::shared_ptr<Core> core, std::shared_ptr<NatsSource> source,
                        MessageHandler handler, std::size_t threads)
        : core_(std::move(core)),
          source_(std::move(source)),
          threads_(std::move(handler), source_, threads) {}

    ~ChannelSubscription() override {
        {
            const std::lock_guard lock(core_->sourcesMutex_);
            std::erase(core_->sources_, source_);
        }
        threads_.close();
    }

private:
    const std::shared_ptr<Core> core_;
    const std::shared_ptr<NatsSource> source_;
    DeliveryThreads threads_;
};

class NatsBus::Core::Client final : public MessageService {
public:
    explicit Client(std::shared_ptr<Core> core) : core_(std::move(core)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        return resolved([&] { return core_->subscribe(channel, std::move(handler)); });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return resolved([&] { core_->publish(channel, payload); });
    }

    std::size_t maxPayload(const std::string&) const override { return core_->maxPayload(); }

private:
    const std::shared_ptr<Core> core_;
};

NatsBus::Core::~Core() {
    nats::forget(listener_);
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_all();
    if (keeper_.joinable()) {
        keeper_.join();
    }
}

std::shared_ptr<MessageService> NatsBus::Core::connect(const std::string& clientName) {
    const std::lock_guard lock(connecting_);
    if (isStopping()) {
        throw std::runtime_error(closedText);
    }
    if (!keeper_.joinable()) {
        if (listener_ == 0) {
            listener_ = nats::listen(weak_from_this());
        }
        ConnectionHandle made = connectPatiently(clientName);
        logger().info("Connected to NATS at {}.", nats::serverOf(made->get()));
        use(made);
        keeper_ = std::thread([this, clientName] { keepConnected(clientName); });
    }
    return std::make_shared<Client>(shared_from_this());
}

// Tries until a server is reached, one refuses, or the time for it is over.
ConnectionHandle NatsBus::Core::connectPatiently(const std::string& name) {
    const Clock::time_point deadline = Clock::now() + options_.connectTimeout;
    for (auto delay = std::chrono::milliseconds(0); pause(delay); delay = nextDelay(delay)) {
        try {
            return nats::openConnection(options_, name, listener_);
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
bool NatsBus::Core::pause(std::chrono::milliseconds delay) {
    std::unique_lock lock(mutex_);
    return !changed_.wait_for(lock, delay, [this] { return stopping_; });
}

// The thread that makes another connection whenever libnats has given one up.
void NatsBus::Core::keepConnected(const std::string& name) {
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

void NatsBus::Core::reconnect(const std::string& name) {
    for (auto delay = firstRetryDelay; pause(delay); delay = nextDelay(delay)) {
        try {
            ConnectionHandle made = nats::openConnection(options_, name, listener_);
            const std::string server = nats::serverOf(made->get());
            const std::lock_guard sourcesLock(sourcesMutex_);
            use(made);
            for (const auto& source : sources_) {
                attach(*source);
            }
            disconnected_ = false;
            logger().warn("Connected to NATS again, at {}.", server);
            return;
        } catch (const std::exception& error) {
            if (!isStopping()) {
                logger().warn("{} Trying again.", error.what());
            }
        }
    }
}

// Puts `made` in the place of the connection that there was, unless the bus has ended meanwhile.
void NatsBus::Core::use(ConnectionHandle& made) {
    const std::lock_guard lock(mutex_);
    if (stopping_) {
        throw std::runtime_error(closedText);
    }
    connection_.swap(made);
}

ConnectionHandle NatsBus::Core::connection() {
    const std::lock_guard lock(mutex_);
    if (!connection_) {
        throw std::runtime_error(closedText);
    }
    return connection_;
}

// Subscribes on the connection that stands. When it is lost for good just then, that happens on the
// next one.
void NatsBus::Core::attach(NatsSource& source) {
    try {
        source.attach(connection());
    } catch (const NatsError& error) {
        if (error.status() != NATS_CONNECTION_CLOSED) {
            throw;
        }
    }
}

std::shared_ptr<Subscription> NatsBus::Core::subscribe(const std::string& channel,
                                                       MessageHandler handler) {
    if (!handler) {
        throw std::invalid_argument("No handler was given for channel \"" + printable(channel) +
                                    "\".");
    }
    nats::requireSubject(channel);
    const std::size_t threads =
        deliveryThreadCount(channel, options_.concurrentChannels, options_.concurrency);
    const bool queued = contains(options_.queueChannels, channel);
    auto source = std::make_shared<NatsSource>(channel, queued ? options_.queueGroup : "",
                                               options_.maxPendingMessages,
                                               options_.maxPendingBytes, threads);
    auto subscription = std::make_shared<ChannelSubscription>(shared_from_this(), source,
                                                              std::move(handler), threads);
    {
        const std::lock_guard lock(sourcesMutex_);
        if (isStopping()) {
            throw std::runtime_error(closedText);
        }
        attach(*source);
        sources_.push_back(std::move(source));
    }
    // Not before the server has it can others publish to it. Without a server there is nobody.
    if (isConnected()) {
        natsConnection_FlushTimeout(connection()->get(), subscribeTimeout);
    }
    return subscription;
}

void NatsBus::Core::publish(const std::string& channel, const DataBuffer& payload) {
    try {
        send(channel, payload);
    } catch (const std::exception& error) {
        const std::string text = "A message of " + std::to_string(payload.length()) +
                                 " bytes on channel \"" + printable(channel) +
                                 "\" was not published: " + error.what();
        logger().error(text);
        throw std::runtime_error(text);
    }
}

void NatsBus::Core::send(const std::string& channel, const DataBuffer& payload) {
    nats::requireSubject(channel);
    const ConnectionHandle connection = this->connection();
    if (std::cmp_greater(payload.length(), largestMessage)) {
        throw std::runtime_error("NATS takes messages of less than 2 GiB.");
    }
    const natsStatus status = natsConnection_Publish(
        connection->get(), channel.c_str(), payload.data(), static_cast<int>(payload.length()));
    if (status == NATS_MAX_PAYLOAD) {
        throw std::runtime_error("The server takes messages of up to " +
                                 std::to_string(natsConnection_GetMaxPayload(connection->get())) +
                                 " bytes.");
    }
    if (status == NATS_INSUFFICIENT_BUFFER) {
        throw std::runtime_error("No server is connected, and as much as may wait for one does.");
    }
    if (status == NATS_TIMEOUT) {
        // The server has a part of the message and would take what comes next for the rest.
        natsConnection_Close(connection->get());
    }
    nats::check(status, "The message could not be sent");
    // Not asked of libnats, whose lock the threads that send and receive contend for.
    if (disconnected_) {
        unsent_ = true;
    }
}

std::size_t NatsBus::Core::maxPayload() {
    ConnectionHandle connection;
    {
        const std::lock_guard lock(mutex_);
        connection = connection_;
    }
    // Asked each time, since the next server, or this one after it was configured anew, may differ.
    const std::int64_t limit = connection ? natsConnection_GetMaxPayload(connection->get()) : 0;
    // A server that has not said it yet says zero.
    return limit > 0 ? static_cast<std::size_t>(std::min(limit, largestMessage)) : largestMessage;
}

bool NatsBus::Core::isStopping() {
    const std::lock_guard lock(mutex_);
    return stopping_;
}

bool NatsBus::Core::isConnected() {
    const std::lock_guard lock(mutex_);
    return connection_ && connection_->isConnected();
}

bool NatsBus::Core::drain(std::chrono::milliseconds timeout) {
    const Clock::time_point deadline = Clock::now() + timeout;
    {
        const std::lock_guard lock(mutex_);
        stopping_ = true;
    }
    changed_.notify_all();
    std::vector<std::shared_ptr<NatsSource>> sources;
    {
        const std::lock_guard lock(sourcesMutex_);
        sources = sources_;
    }
    for (const auto& source : sources) {
        source->drain(isConnected());
    }
    bool finished = true;
    for (const auto& source : sources) {
        finished = source->waitUntilDrained(deadline) && finished;
    }
    ConnectionHandle connection;
    {
        const std::lock_guard lock(mutex_);
        connection.swap(connection_);
    }
    if (connection) {
        finished = flush(*connection, deadline) && finished;
        natsConnection_Close(connection->get());
    }
    return finished;
}

// Waits until the server has what was published.
bool NatsBus::Core::flush(const nats::Connection& connection, Clock::time_point deadline) {
    if (!connection.isConnected() && !unsent_) {
        return true;
    }
    return natsConnection_FlushTimeout(connection.get(), millisecondsUntil(deadline)) == NATS_OK;
}

void NatsBus::Core::onDisconnected(const std::string& reason) {
    disconnected_ = true;
    if (!isStopping()) {
        logger().warn("The connection to NATS is lost: {}.", reason);
    }
}

void NatsBus::Core::onReconnected(const std::string& server) {
    disconnected_ = false;
    unsent_ = false;
    logger().warn("Connected to NATS again, at {}.", server);
}

void NatsBus::Core::onClosed(const std::string& reason) {
    // Having locked, as isStopping does: the keeper saw that it is closed, or waits by now.
    if (!isStopping()) {
        logger().warn("NATS has ended the connection: {}.", reason);
    }
    changed_.notify_all();
}

void NatsBus::Core::onError(natsStatus status, const std::string& reason,
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

NatsBus::NatsBus(std::shared_ptr<Core> core) : core_(std::move(core)) {}

NatsBus::~NatsBus() = default;

std::shared_ptr<NatsBus> NatsBus::create(NatsOptions options) {
    return std::shared_ptr<NatsBus>(new NatsBus(std::make_shared<Core>(std::move(options))));
}

futures::Future<std::shared_ptr<MessageService>> NatsBus::connect(const std::string& clientName) {
    return resolved([&] { return core_->connect(clientName); });
}

bool NatsBus::isConnected() const {
    return core_->isConnected();
}

bool NatsBus::drain(std::chrono::milliseconds timeout) {
    return core_->drain(timeout);
}

}  // namespace platform::messaging
