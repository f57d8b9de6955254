// SPDX-License-Identifier: Apache-2.0
// The core holds the connections, which clients and subscriptions share. Messages of one piece go
// over the first. Documents come over others, so that nothing waits behind them:
//
//   first:     requests and answers of one piece, notifications
//   separate:  requests of one piece on the separate channels
//   transfers: offers of long requests; the pieces and what is said about them
#include "platform/messaging/nats/nats_bus.h"

#include <spdlog/logger.h>

#include <algorithm>
#include <exception>
#include <functional>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <utility>

#include "platform/messaging/channels.h"
#include "platform/messaging/delivery_threads.h"
#include "platform/messaging/log.h"
#include "platform/messaging/nats/kept_connection.h"
#include "platform/messaging/nats/long_messages.h"
#include "platform/messaging/nats/nats_source.h"
#include "platform/messaging/nats/subject.h"
#include "platform/messaging/resolved.h"
#include "platform/messaging/turns.h"
#include "platform/text/quoted.h"

namespace platform::messaging {
namespace {

using Clock = std::chrono::steady_clock;
using nats::KeptConnection;
using nats::LongMessages;
using nats::NatsSource;
using nats::ReceivedMessage;
using text::printable;

// The bounds on waiting messages about transfers: more than all that clients are given room to
// send.
constexpr std::size_t maxPendingWords = 1 << 20;
constexpr std::size_t maxPendingPieces = std::size_t{512} << 20;

bool contains(const std::vector<std::string>& list, const std::string& text) {
    return std::find(list.begin(), list.end(), text) != list.end();
}

}  // namespace

class NatsBus::Core final : public std::enable_shared_from_this<Core> {
public:
    explicit Core(NatsOptions options);
    ~Core();

    std::shared_ptr<MessageService> connect(const std::string& clientName);
    std::shared_ptr<Subscription> subscribe(const std::string& channel, MessageHandler handler);
    void publish(const std::string& channel, DataBuffer payload);
    std::size_t maxPayload(const std::string& channel);
    bool isConnected() const {
        return first_->isConnected() && separate_->isConnected() &&
               (!transfers_ || transfers_->isConnected());
    }
    std::uint64_t reconnects() const;
    NatsBacklog backlog() const;
    bool drain(std::chrono::milliseconds timeout);

private:
    class Client;
    class ChannelSubscription;
    class Listener;

    std::shared_ptr<NatsSource> makeSource(const std::string& channel, std::size_t threads);
    std::unique_ptr<Listener> listenToOffers(const std::string& channel);
    std::string groupOf(const std::string& channel) const;
    const std::shared_ptr<KeptConnection>& connectionOf(const std::string& channel) const;

    // Those that messages of one piece come over.
    std::vector<std::shared_ptr<KeptConnection>> incoming() const;

    const NatsOptions options_;
    const std::shared_ptr<KeptConnection> first_;

    // The first, when no channel is separate.
    const std::shared_ptr<KeptConnection> separate_;

    // Null when no messages are long.
    const std::shared_ptr<KeptConnection> transfers_;
    const std::shared_ptr<LongMessages> long_;

    std::mutex mutex_;                 // guards what follows
    std::unique_ptr<Listener> words_;  // none before the first connection
};

// The thread that handles what comes on one subject of the connection for transfers.
class NatsBus::Core::Listener {
public:
    Listener(std::shared_ptr<KeptConnection> connection, const std::string& subject,
             std::string queueGroup, const std::function<void(natsMsg*)>& handle)
        : connection_(std::move(connection)),
          source_(std::make_shared<NatsSource>(subject, std::move(queueGroup), maxPendingWords,
                                               maxPendingPieces, 1,
                                               [handle](ReceivedMessage received) {
                                                   handle(received.get());
                                                   return std::nullopt;
                                               })),
          thread_([](const JsonMessage&) {}, source_, 1) {
        connection_->add(source_);
    }

    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;
    ~Listener() { connection_->remove(source_); }

private:
    const std::shared_ptr<KeptConnection> connection_;
    const std::shared_ptr<NatsSource> source_;
    DeliveryThreads thread_;
};

class NatsBus::Core::ChannelSubscription final : public Subscription {
public:
    ChannelSubscription(std::shared_ptr<Core> core, std::shared_ptr<NatsSource> source,
                        MessageHandler handler, std::size_t threads)
        : core_(std::move(core)),
          source_(std::move(source)),
          threads_(std::move(handler), source_, threads) {}

    // The requests that come in pieces have a thread of their own, and where requests are handled
    // one at a time, it takes turns with the other.
    ChannelSubscription(std::shared_ptr<Core> core, std::shared_ptr<NatsSource> source,
                        const std::shared_ptr<MessageHandler>& handler, std::size_t threads,
                        std::shared_ptr<MessageSource> whole, std::unique_ptr<Listener> offers)
        : core_(std::move(core)),
          source_(std::move(source)),
          turns_(threads == 1 ? std::make_shared<Turns>() : nullptr),
          threads_(share(handler), inTurn(source_), threads),
          whole_(std::make_unique<DeliveryThreads>(share(handler), inTurn(std::move(whole)), 1)),
          offers_(std::move(offers)) {}

    ~ChannelSubscription() override {
        offers_.reset();
        for (const auto& connection : core_->incoming()) {
            connection->remove(source_);
        }
        whole_.reset();
        threads_.close();
    }

private:
    static MessageHandler share(const std::shared_ptr<MessageHandler>& handler) {
        return [handler](const JsonMessage& message) { (*handler)(message); };
    }

    std::shared_ptr<MessageSource> inTurn(std::shared_ptr<MessageSource> source) const {
        return turns_ ? std::make_shared<TurnTakingSource>(std::move(source), turns_)
                      : std::move(source);
    }

    const std::shared_ptr<Core> core_;
    const std::shared_ptr<NatsSource> source_;
    const std::shared_ptr<Turns> turns_;
    DeliveryThreads threads_;
    std::unique_ptr<DeliveryThreads> whole_;
    std::unique_ptr<Listener> offers_;
};

class NatsBus::Core::Client final : public MessageService {
public:
    explicit Client(std::shared_ptr<Core> core) : core_(std::move(core)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        return resolved([&] { return core_->subscribe(channel, std::move(handler)); });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return resolved([&] { core_->publish(channel, std::move(payload)); });
    }

    std::size_t maxPayload(const std::string& channel) const override {
        return core_->maxPayload(channel);
    }

private:
    const std::shared_ptr<Core> core_;
};

NatsBus::Core::Core(NatsOptions options)
    : options_(std::move(options)),
      first_(std::make_shared<KeptConnection>(options_)),
      separate_(options_.separateChannels.empty() ? first_
                                                  : std::make_shared<KeptConnection>(options_)),
      transfers_(options_.longMessages.answerPrefixes.empty()
                     ? nullptr
                     : std::make_shared<KeptConnection>(options_)),
      long_(transfers_
                ? std::make_shared<LongMessages>(
                      options_.longMessages,
                      [first = first_, transfers = transfers_](const nats::Note& note) {
                          // An announcement does not wait behind pieces.
                          const auto& way = note.payload.empty() ? first : transfers;
                          way->publish(note.subject, nats::piecesHeader, note.word, note.payload);
                      })
                : nullptr) {}

NatsBus::Core::~Core() {
    if (long_) {
        long_->close();
    }
    words_.reset();
}

std::shared_ptr<MessageService> NatsBus::Core::connect(const std::string& clientName) {
    first_->connect(clientName);
    if (separate_ != first_) {
        separate_->connect(clientName + " separate channels");
    }
    if (transfers_) {
        transfers_->connect(clientName + " transfers");
        long_->start();
        const std::lock_guard lock(mutex_);
        if (!words_) {
            words_ = std::make_unique<Listener>(
                transfers_, long_->subject(), "",
                [all = long_](natsMsg* received) { all->takeWord(received); });
        }
    }
    return std::make_shared<Client>(shared_from_this());
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
    auto source = makeSource(channel, threads);
    const std::shared_ptr<KeptConnection>& connection = connectionOf(channel);
    std::shared_ptr<Subscription> subscription;
    if (long_ && long_->areLong(channel)) {
        subscription = std::make_shared<ChannelSubscription>(
            shared_from_this(), source, std::make_shared<MessageHandler>(std::move(handler)),
            threads, long_->wholeRequests(channel), listenToOffers(channel));
    } else {
        subscription = std::make_shared<ChannelSubscription>(shared_from_this(), source,
                                                             std::move(handler), threads);
    }
    connection->add(source);
    connection->requirePermitted(channel);
    return subscription;
}

std::shared_ptr<NatsSource> NatsBus::Core::makeSource(const std::string& channel,
                                                      std::size_t threads) {
    const auto name = std::make_shared<const std::string>(channel);
    const std::shared_ptr<LongMessages> all = long_ && long_->areLong(channel) ? long_ : nullptr;
    return std::make_shared<NatsSource>(
        channel, groupOf(channel), options_.maxPendingMessages, options_.maxPendingBytes, threads,
        [name, all](ReceivedMessage received) -> std::optional<QueuedMessage> {
            std::shared_ptr<const void> companion =
                all ? all->takeRequest(*name, received.get()) : nullptr;
            return nats::makeMessage(name, std::move(received), std::move(companion));
        });
}

std::unique_ptr<NatsBus::Core::Listener> NatsBus::Core::listenToOffers(const std::string& channel) {
    return std::make_unique<Listener>(
        transfers_, channel + offerSuffix, groupOf(channel),
        [all = long_, channel](natsMsg* received) { all->takeOffer(channel, received); });
}

std::string NatsBus::Core::groupOf(const std::string& channel) const {
    return contains(options_.queueChannels, channel) ? options_.queueGroup : "";
}

const std::shared_ptr<KeptConnection>& NatsBus::Core::connectionOf(
    const std::string& channel) const {
    return contains(options_.separateChannels, channel) ? separate_ : first_;
}

std::vector<std::shared_ptr<KeptConnection>> NatsBus::Core::incoming() const {
    if (separate_ == first_) {
        return {first_};
    }
    return {first_, separate_};
}

void NatsBus::Core::publish(const std::string& channel, DataBuffer payload) {
    try {
        if (!long_ || !long_->publish(channel, payload)) {
            first_->publish(channel, payload.view());
        }
    } catch (const std::exception& error) {
        const std::string text = "A message of " + std::to_string(payload.length()) +
                                 " bytes on channel \"" + printable(channel) +
                                 "\" was not published: " + error.what();
        logger().error(text);
        throw std::runtime_error(text);
    }
}

std::size_t NatsBus::Core::maxPayload(const std::string& channel) {
    const std::optional<std::size_t> inPieces =
        long_ ? long_->longestAnswer(channel) : std::nullopt;
    return std::max(inPieces.value_or(0), first_->maxPayload());
}

std::uint64_t NatsBus::Core::reconnects() const {
    std::uint64_t all = transfers_ ? transfers_->reconnects() : 0;
    for (const auto& connection : incoming()) {
        all += connection->reconnects();
    }
    return all;
}

NatsBacklog NatsBus::Core::backlog() const {
    NatsBacklog all;
    for (const auto& connection : incoming()) {
        for (const auto& source : connection->sources()) {
            const NatsBacklog one = source->backlog();
            all.messages += one.messages;
            all.bytes += one.bytes;
            all.dropped += one.dropped;
        }
    }
    return all;
}

bool NatsBus::Core::drain(std::chrono::milliseconds timeout) {
    const Clock::time_point deadline = Clock::now() + timeout;
    std::vector<std::shared_ptr<NatsSource>> sources;
    for (const auto& connection : incoming()) {
        connection->stop();
        for (const auto& source : connection->sources()) {
            source->drain(connection->isConnected());
            sources.push_back(source);
        }
    }
    if (transfers_) {
        transfers_->stop();
    }
    bool finished = true;
    for (const auto& source : sources) {
        finished = source->waitUntilDrained(deadline) && finished;
    }
    if (long_) {
        finished = long_->drain(deadline) && finished;
        long_->close();
        finished = transfers_->close(deadline) && finished;
    }
    for (const auto& connection : incoming()) {
        finished = connection->close(deadline) && finished;
    }
    return finished;
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

std::uint64_t NatsBus::reconnects() const {
    return core_->reconnects();
}

NatsBacklog NatsBus::backlog() const {
    return core_->backlog();
}

bool NatsBus::drain(std::chrono::milliseconds timeout) {
    return core_->drain(timeout);
}

}  // namespace platform::messaging
