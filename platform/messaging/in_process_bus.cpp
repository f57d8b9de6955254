// SPDX-License-Identifier: Apache-2.0
// The path of a message: it is counted against the bound, shown to the observers, and queued at
// each subscription of its channel. All lasting state is in the core, which clients, subscriptions
// and the bus share; queues and observers guard themselves.
#include "platform/messaging/in_process_bus.h"

#include <condition_variable>
#include <mutex>
#include <stdexcept>
#include <unordered_map>
#include <utility>

#include "platform/messaging/delivery_queue.h"
#include "platform/messaging/delivery_threads.h"
#include "platform/messaging/log.h"
#include "platform/messaging/resolved.h"
#include "platform/messaging/revocable_function.h"

namespace platform::messaging {
namespace {

// The messages that a bus has accepted and not finished. The holds that it hands out may outlive
// the bus.
class Backlog : public std::enable_shared_from_this<Backlog> {
public:
    using Hold = std::shared_ptr<const void>;

    explicit Backlog(std::size_t maxQueuedBytes) : maxQueuedBytes_(maxQueuedBytes) {}

    // Keeps the bus from being idle until the hold is released.
    Hold holdBusy() {
        {
            const std::lock_guard lock(mutex_);
            ++unfinished_;
        }
        return Hold(nullptr, [backlog = shared_from_this()](const void*) { backlog->finish(); });
    }

    // Counts a message of `bytes` as queued until the hold is released; throws when fewer bytes are
    // left of the bound.
    Hold holdQueued(std::size_t bytes, const std::string& channel) {
        {
            const std::lock_guard lock(mutex_);
            if (bytes > maxQueuedBytes_ - queuedBytes_) {
                throw std::runtime_error("Message of " + std::to_string(bytes) +
                                         " bytes on channel \"" + channel +
                                         "\" was not accepted: " + std::to_string(queuedBytes_) +
                                         " bytes are waiting to be delivered, and " +
                                         std::to_string(maxQueuedBytes_) + " may wait at most.");
            }
            queuedBytes_ += bytes;
            ++queuedMessages_;
        }
        return Hold(nullptr, [backlog = shared_from_this(), bytes](const void*) {
            const std::lock_guard lock(backlog->mutex_);
            backlog->queuedBytes_ -= bytes;
            --backlog->queuedMessages_;
            backlog->dequeued_.notify_all();
        });
    }

    void waitUntilQueuedAtMost(std::size_t messages, std::size_t bytes) {
        std::unique_lock lock(mutex_);
        dequeued_.wait(lock, [&] { return queuedMessages_ <= messages && queuedBytes_ <= bytes; });
    }

    void waitUntilIdle() {
        std::unique_lock lock(mutex_);
        idle_.wait(lock, [this] { return unfinished_ == 0; });
    }

    std::size_t queuedBytes() {
        const std::lock_guard lock(mutex_);
        return queuedBytes_;
    }

private:
    void finish() {
        const std::lock_guard lock(mutex_);
        if (--unfinished_ == 0) {
            idle_.notify_all();
        }
    }

    const std::size_t maxQueuedBytes_;

    std::mutex mutex_;  // guards what follows
    std::condition_variable idle_;
    std::condition_variable dequeued_;
    std::size_t queuedBytes_ = 0;
    std::size_t queuedMessages_ = 0;
    std::size_t unfinished_ = 0;
};

using ObserverFunction = RevocableFunction<std::string_view, const JsonMessage&>;

}  // namespace

// What the clients and the subscriptions of a bus share. No callback runs while its mutex is held.
class InProcessBus::Core : public std::enable_shared_from_this<Core> {
public:
    explicit Core(InProcessBusOptions options)
        : options_(std::move(options)),
          backlog_(std::make_shared<Backlog>(options_.maxQueuedBytes)) {}

    std::shared_ptr<MessageService> connect(const std::string& clientName);
    std::shared_ptr<Subscription> subscribe(const std::string& channel, MessageHandler handler);
    std::shared_ptr<Subscription> observe(MessageObserver observer);
    void publish(std::string_view clientName, const std::string& channel, DataBuffer payload);

    Backlog& backlog() noexcept { return *backlog_; }

private:
    class Client;
    class ChannelSubscription;
    class Observation;
    using Queues = std::vector<std::shared_ptr<DeliveryQueue>>;
    using Observers = std::vector<std::shared_ptr<ObserverFunction>>;

    Queues queuesOf(const std::string& channel);
    Observers observers();

    const InProcessBusOptions options_;
    const std::shared_ptr<Backlog> backlog_;

    std::mutex mutex_;  // guards what follows
    std::unordered_map<std::string, Queues> queues_;
    Observers observers_;
};

class InProcessBus::Core::ChannelSubscription final : public Subscription {
public:
    ChannelSubscription(std::shared_ptr<Core> core, const std::string& channel,
                        MessageHandler handler)
        : core_(std::move(core)),
          channel_(channel),
          queue_(std::make_shared<DeliveryQueue>(
              std::move(handler), deliveryThreadCount(channel, core_->options_.concurrentChannels,
                                                      core_->options_.concurrency))) {}

    void begin() {
        const std::lock_guard lock(core_->mutex_);
        core_->queues_[channel_].push_back(queue_);
    }

    ~ChannelSubscription() override {
        {
            const std::lock_guard lock(core_->mutex_);
            const auto found = core_->queues_.find(channel_);
            if (found != core_->queues_.end()) {
                std::erase(found->second, queue_);
                if (found->second.empty()) {
                    core_->queues_.erase(found);
                }
            }
        }
        // A publisher may hold the queue a moment longer, so it does not close by itself here.
        queue_->close();
    }

private:
    const std::shared_ptr<Core> core_;
    const std::string channel_;
    const std::shared_ptr<DeliveryQueue> queue_;
};

class InProcessBus::Core::Observation final : public Subscription {
public:
    Observation(std::shared_ptr<Core> core, MessageObserver observer)
        : core_(std::move(core)),
          observer_(std::make_shared<ObserverFunction>(std::move(observer))) {}

    void begin() {
        const std::lock_guard lock(core_->mutex_);
        core_->observers_.push_back(observer_);
    }

    ~Observation() override {
        {
            const std::lock_guard lock(core_->mutex_);
            std::erase(core_->observers_, observer_);
        }
        observer_->revoke();
    }

private:
    const std::shared_ptr<Core> core_;
    const std::shared_ptr<ObserverFunction> observer_;
};

class InProcessBus::Core::Client final : public MessageService {
public:
    Client(std::shared_ptr<Core> core, std::string name)
        : core_(std::move(core)), name_(std::move(name)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        return resolved([&] { return core_->subscribe(channel, std::move(handler)); });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return resolved([&] { core_->publish(name_, channel, std::move(payload)); });
    }

private:
    const std::shared_ptr<Core> core_;
    const std::string name_;
};

std::shared_ptr<MessageService> InProcessBus::Core::connect(const std::string& clientName) {
    return std::make_shared<Client>(shared_from_this(), clientName);
}

std::shared_ptr<Subscription> InProcessBus::Core::subscribe(const std::string& channel,
                                                            MessageHandler handler) {
    if (!handler) {
        throw std::invalid_argument("No handler was given for channel \"" + channel + "\".");
    }
    auto subscription =
        std::make_shared<ChannelSubscription>(shared_from_this(), channel, std::move(handler));
    subscription->begin();
    return subscription;
}

std::shared_ptr<Subscription> InProcessBus::Core::observe(MessageObserver observer) {
    if (!observer) {
        throw std::invalid_argument("No observer was given.");
    }
    auto observation = std::make_shared<Observation>(shared_from_this(), std::move(observer));
    observation->begin();
    return observation;
}

void InProcessBus::Core::publish(std::string_view clientName, const std::string& channel,
                                 DataBuffer payload) {
    const Backlog::Hold busy = backlog_->holdBusy();
    const Queues queues = queuesOf(channel);
    Backlog::Hold queued;
    if (!queues.empty()) {
        queued = backlog_->holdQueued(payload.length(), channel);
    }
    const JsonMessage message(std::make_shared<const std::string>(channel),
                              std::make_shared<const DataBuffer>(std::move(payload)));
    // Observers first, so that none sees an answer before the request that it answers.
    for (const auto& observer : observers()) {
        try {
            (*observer)(clientName, message);
        } catch (...) {
            logFailure("observer", channel);
        }
    }
    for (const auto& queue : queues) {
        queue->push({message, queued, busy});
    }
}

InProcessBus::Core::Queues InProcessBus::Core::queuesOf(const std::string& channel) {
    const std::lock_guard lock(mutex_);
    const auto found = queues_.find(channel);
    return found != queues_.end() ? found->second : Queues();
}

InProcessBus::Core::Observers InProcessBus::Core::observers() {
    const std::lock_guard lock(mutex_);
    return observers_;
}

InProcessBus::InProcessBus(std::shared_ptr<Core> core) : core_(std::move(core)) {}

InProcessBus::~InProcessBus() = default;

std::shared_ptr<InProcessBus> InProcessBus::create(InProcessBusOptions options) {
    auto core = std::make_shared<Core>(std::move(options));
    return std::shared_ptr<InProcessBus>(new InProcessBus(std::move(core)));
}

futures::Future<std::shared_ptr<MessageService>> InProcessBus::connect(
    const std::string& clientName) {
    return resolved([&] { return core_->connect(clientName); });
}

std::shared_ptr<Subscription> InProcessBus::observe(MessageObserver observer) {
    return core_->observe(std::move(observer));
}

void InProcessBus::waitUntilIdle() {
    core_->backlog().waitUntilIdle();
}

void InProcessBus::waitUntilQueuedAtMost(std::size_t messages, std::size_t bytes) {
    core_->backlog().waitUntilQueuedAtMost(messages, bytes);
}

std::size_t InProcessBus::queuedBytes() const {
    return core_->backlog().queuedBytes();
}

}  // namespace platform::messaging
