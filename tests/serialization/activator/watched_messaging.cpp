// SPDX-License-Identifier: Apache-2.0
#include "tests/serialization/activator/watched_messaging.h"

#include <map>
#include <mutex>
#include <string_view>

namespace test {

using platform::DataBuffer;
using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;
using platform::messaging::MessageHandler;
using platform::messaging::MessageServiceOptions;
using platform::messaging::setTransport;
using platform::messaging::Transport;

namespace {

template <typename T>
futures::Future<T> resolvedWith(T value) {
    futures::Promise<T> promise;
    promise.setValue(std::move(value));
    return promise.getFuture();
}

}  // namespace

struct WatchedMessaging::State {
    const std::shared_ptr<InProcessBus> bus = InProcessBus::create();

    std::mutex mutex;  // guards what follows
    int clients = 0;
    std::vector<std::string> events;
    std::map<std::string, std::function<Subscribed(Subscribed)>> subscribe;

    void record(std::string event) {
        const std::lock_guard lock(mutex);
        events.push_back(std::move(event));
    }
};

class WatchedMessaging::WatchedSubscription final : public Subscription {
public:
    WatchedSubscription(std::shared_ptr<State> state, std::string name,
                        std::shared_ptr<Subscription> subscription)
        : state_(std::move(state)),
          name_(std::move(name)),
          subscription_(std::move(subscription)) {}

    ~WatchedSubscription() override {
        subscription_.reset();
        state_->record("end of " + name_);
    }

private:
    const std::shared_ptr<State> state_;
    const std::string name_;
    std::shared_ptr<Subscription> subscription_;
};

class WatchedMessaging::WatchedClient final : public MessageService {
public:
    WatchedClient(std::shared_ptr<State> state, const std::string& name)
        : state_(std::move(state)), client_(state_->bus->connect(name).get()) {
        const std::lock_guard lock(state_->mutex);
        name_ = "client " + std::to_string(++state_->clients);
        state_->events.push_back(name_);
    }

    ~WatchedClient() override {
        client_.reset();
        state_->record("end of " + name_);
    }

    Subscribed subscribe(const std::string& channel, MessageHandler handler) override {
        const std::string name = channel + " for " + name_;
        state_->record(name);
        Subscribed subscribed =
            resolvedWith<std::shared_ptr<Subscription>>(std::make_shared<WatchedSubscription>(
                state_, name, client_->subscribe(channel, std::move(handler)).get()));
        const auto special = state_->subscribe.find(channel);
        return special != state_->subscribe.end() ? special->second(std::move(subscribed))
                                                  : std::move(subscribed);
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return client_->publish(channel, std::move(payload));
    }

private:
    const std::shared_ptr<State> state_;
    std::shared_ptr<MessageService> client_;
    std::string name_;
};

WatchedMessaging::WatchedMessaging() : state_(std::make_shared<State>()) {
    createWith([this](const std::string& clientName, const MessageServiceOptions&) {
        return resolvedWith(connect(clientName));
    });
}

WatchedMessaging::~WatchedMessaging() {
    setTransport({});
}

void WatchedMessaging::createWith(Transport create) {
    setTransport(std::move(create));
}

void WatchedMessaging::subscribeWith(const std::string& channel,
                                     std::function<Subscribed(Subscribed)> subscribe) {
    state_->subscribe[channel] = std::move(subscribe);
}

std::shared_ptr<WatchedMessaging::MessageService> WatchedMessaging::connect(
    const std::string& clientName) {
    return std::make_shared<WatchedClient>(state_, clientName);
}

std::vector<std::string> WatchedMessaging::publish(const std::string& channel,
                                                   const std::string& payload) {
    std::mutex mutex;
    std::vector<std::string> answers;
    const auto observation =
        state_->bus->observe([&](std::string_view clientName, const JsonMessage& message) {
            if (clientName == "EditorSerialization") {
                const std::lock_guard lock(mutex);
                answers.push_back(std::string(message.channel()) + " " +
                                  std::string(message.payload()));
            }
        });
    const auto asker = state_->bus->connect("test").get();
    asker->publish(channel, DataBuffer::copyOf(payload)).get();
    state_->bus->waitUntilIdle();
    return answers;
}

std::vector<std::string> WatchedMessaging::events() const {
    const std::lock_guard lock(state_->mutex);
    return state_->events;
}

}  // namespace test
