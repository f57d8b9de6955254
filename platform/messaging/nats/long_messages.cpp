// SPDX-License-Identifier: Apache-2.0
// The transfers are called under the mutex; their messages are sent without it, so that a server
// that does not read does not block a thread that only leaves an answer here. Pieces stay in order,
// because all of them are sent by the one thread that handles what clients say.
#include "platform/messaging/nats/long_messages.h"

#include <spdlog/logger.h>

#include <algorithm>
#include <exception>
#include <iterator>
#include <random>
#include <utility>

#include "platform/messaging/log.h"
#include "platform/messaging/nats/subject.h"

namespace platform::messaging::nats {
namespace {

constexpr std::chrono::seconds tickInterval{1};

constexpr const char* workerEnds = "this worker ends";

std::string makeWorkerName() {
    std::random_device random;
    constexpr std::string_view digits = "0123456789abcdef";
    std::string name;
    while (name.size() < 24) {
        name += digits[random() % digits.size()];
    }
    return name;
}

std::optional<ClientWord> wordOf(natsMsg* received) {
    const char* header = nullptr;
    if (natsMsgHeader_Get(received, piecesHeader, &header) != NATS_OK || header == nullptr) {
        return std::nullopt;
    }
    return parseClientWord(header);
}

std::string_view payloadOf(natsMsg* received) {
    return {natsMsg_GetData(received), static_cast<std::size_t>(natsMsg_GetDataLength(received))};
}

Reserve reserveFrom(MemoryBudget& budget) {
    return [&budget](std::size_t bytes) -> Reservation {
        std::optional<MemoryBudget::Reservation> reserved = budget.tryReserve(bytes);
        return reserved ? std::make_shared<MemoryBudget::Reservation>(std::move(*reserved))
                        : nullptr;
    };
}

}  // namespace

// While it lives, answers on a channel may go in pieces.
class LongMessages::Expectation {
public:
    explicit Expectation(std::weak_ptr<LongMessages> all) : all_(std::move(all)) {}
    Expectation(const Expectation&) = delete;
    Expectation& operator=(const Expectation&) = delete;

    // Takes the mutex.
    ~Expectation() {
        const auto alive = place_ ? all_.lock() : nullptr;
        if (alive) {
            {
                const std::lock_guard lock(alive->mutex_);
                alive->expected_.erase(*place_);
            }
            alive->changed_.notify_all();
        }
    }

    // Must be called once, with the mutex of `all` held.
    void begin(LongMessages& all, const ReturnAddress& address) {
        place_ = all.expected_.emplace(address.channel, address);
    }

private:
    const std::weak_ptr<LongMessages> all_;
    std::optional<std::multimap<std::string, ReturnAddress>::iterator> place_;
};

// The requests on one channel that came in pieces.
class LongMessages::WholeRequests final : public MessageSource {
public:
    WholeRequests(std::shared_ptr<LongMessages> all, const std::string& channel)
        : all_(std::move(all)), channel_(std::make_shared<const std::string>(channel)) {}

    std::optional<QueuedMessage> next() override {
        struct Owner {
            explicit Owner(const std::shared_ptr<LongMessages>& all) : expectation(all) {}

            Expectation expectation;
            std::shared_ptr<const DataBuffer> payload;
        };
        const auto owner = std::make_shared<Owner>(all_);
        std::unique_lock lock(all_->mutex_);
        std::deque<WholeRequest>& waiting = all_->whole_[*channel_];
        all_->changed_.wait(lock, [&] { return ended_ || !waiting.empty(); });
        if (ended_) {
            return std::nullopt;
        }
        // Under one lock, so that drain finds the request waiting or its answer expected.
        WholeRequest request = std::move(waiting.front());
        waiting.pop_front();
        owner->expectation.begin(*all_, request.address);
        owner->payload = std::move(request.payload);
        // The reservation ends with the waiting: the handler reserves the request's memory together
        // with what else it needs.
        return QueuedMessage{JsonMessage(channel_, owner->payload->view(), owner),
                             std::move(request.reservation), nullptr};
    }

    void end() override {
        {
            const std::lock_guard lock(all_->mutex_);
            ended_ = true;
        }
        all_->changed_.notify_all();
    }

private:
    const std::shared_ptr<LongMessages> all_;
    const std::shared_ptr<const std::string> channel_;
    bool ended_ = false;  // guarded by the mutex of all
};

LongMessages::LongMessages(const LongMessageOptions& options, Send send)
    : options_(options),
      worker_(makeWorkerName()),
      send_(std::move(send)),
      incomingMemory_(options.maxIncomingBytes),
      outgoingMemory_(options.maxOutgoingBytes),
      incoming_(worker_, {.longestRequest = std::min(options.maxMessage, options.maxIncomingBytes)},
                reserveFrom(incomingMemory_)),
      outgoing_(worker_, reserveFrom(outgoingMemory_)),
      roomWatch_(incomingMemory_.onRoom([this] { onRoom(); })) {}

LongMessages::~LongMessages() {
    close();
}

void LongMessages::start() {
    const std::lock_guard lock(mutex_);
    if (!closed_ && !timer_.joinable()) {
        timer_ = std::thread([this] { runTimer(); });
    }
}

void LongMessages::takeWord(natsMsg* received) {
    const std::string_view subject = natsMsg_GetSubject(received);
    const std::optional<ClientWord> word = wordOf(received);
    if (!word || subject.size() < this->subject().size()) {
        return;
    }
    const std::string client(subject.substr(this->subject().size() - 1));
    const Time now = std::chrono::steady_clock::now();
    Notes notes;
    bool hasChanged = false;
    {
        const std::lock_guard lock(mutex_);
        const std::size_t before = incoming_.count() + outgoing_.count();
        switch (word->kind) {
            case ClientWord::Kind::piece: {
                IncomingTransfers::Progress progress =
                    incoming_.piece(client, word->number, payloadOf(received), now);
                notes = std::move(progress.notes);
                if (progress.request) {
                    whole_[progress.request->channel].push_back(std::move(*progress.request));
                }
                break;
            }
            case ClientWord::Kind::room:
                notes = outgoing_.room(client, word->number, now);
                break;
            case ClientWord::Kind::stop:
                notes = incoming_.stop(client, now);
                outgoing_.stop(client);
                break;
            default:
                break;  // is said elsewhere
        }
        hasChanged = incoming_.count() + outgoing_.count() != before;
        ++sending_;
    }
    sendAll(notes);
    {
        const std::lock_guard lock(mutex_);
        --sending_;
        hasChanged = hasChanged || refusing_;  // drain waits for what is being sent, too
    }
    if (hasChanged) {
        changed_.notify_all();
    }
}

void LongMessages::takeOffer(const std::string& channel, natsMsg* received) {
    const std::optional<ClientWord> word = wordOf(received);
    const std::optional<ReturnAddress> address = addressOf(channel, received);
    if (!word || word->kind != ClientWord::Kind::offer || !address) {
        return;
    }
    Notes notes;
    {
        const std::lock_guard lock(mutex_);
        notes = refusing_ ? Notes{stopNote(*address, workerEnds)}
                          : incoming_.offer(channel, *address, word->number,
                                            std::chrono::steady_clock::now());
    }
    timerWakes_.notify_one();
    sendAll(notes);
}

std::shared_ptr<const void> LongMessages::takeRequest(const std::string& channel,
                                                      natsMsg* received) {
    const std::optional<ClientWord> word = wordOf(received);
    if (!word || word->kind != ClientWord::Kind::yes) {
        return nullptr;
    }
    const std::optional<ReturnAddress> address = addressOf(channel, received);
    return address ? expectAnswer(*address) : nullptr;
}

std::shared_ptr<MessageSource> LongMessages::wholeRequests(const std::string& channel) {
    return std::make_shared<WholeRequests>(shared_from_this(), channel);
}

std::optional<std::size_t> LongMessages::longestAnswer(const std::string& channel) {
    const std::lock_guard lock(mutex_);
    return expected_.contains(channel)
               ? std::optional(std::min(options_.maxMessage, options_.maxOutgoingBytes))
               : std::nullopt;
}

bool LongMessages::publish(const std::string& channel, DataBuffer& payload) {
    Notes notes;
    {
        const std::lock_guard lock(mutex_);
        const auto expected = expected_.find(channel);
        if (payload.length() <= pieceSize || expected == expected_.end() ||
            payload.length() > options_.maxMessage) {
            return false;
        }
        notes = outgoing_.answer(expected->second, std::move(payload),
                                 std::chrono::steady_clock::now());
    }
    timerWakes_.notify_one();
    sendAll(notes);
    return true;
}

bool LongMessages::drain(Time deadline) {
    Notes notes;
    {
        const std::lock_guard lock(mutex_);
        refusing_ = true;
        notes = incoming_.stopAll(workerEnds);
    }
    sendAll(notes);
    std::unique_lock lock(mutex_);
    return changed_.wait_until(lock, deadline, [this] {
        const bool isHandled =
            std::ranges::all_of(whole_, [](const auto& each) { return each.second.empty(); });
        return isHandled && expected_.empty() && outgoing_.count() == 0 && sending_ == 0;
    });
}

void LongMessages::close() {
    Notes notes;
    std::thread timer;
    {
        const std::lock_guard lock(mutex_);
        refusing_ = true;
        closed_ = true;
        timer = std::move(timer_);
        notes = incoming_.stopAll(workerEnds);
        std::ranges::move(outgoing_.stopAll(workerEnds), std::back_inserter(notes));
    }
    changed_.notify_all();
    timerWakes_.notify_one();
    sendAll(notes);
    if (timer.joinable()) {
        timer.join();
    }
}

void LongMessages::runTimer() {
    std::unique_lock lock(mutex_);
    while (!closed_) {
        timerWakes_.wait(
            lock, [this] { return closed_ || incoming_.count() > 0 || outgoing_.count() > 0; });
        timerWakes_.wait_for(lock, tickInterval, [this] { return closed_ || hasRoom_.load(); });
        hasRoom_ = false;
        const Notes notes = tick();
        lock.unlock();
        changed_.notify_all();  // drain may wait for it
        sendAll(notes);
        lock.lock();
    }
}

// With the mutex held. What there is no memory to say is not said; the clients ask again.
Notes LongMessages::tick() noexcept {
    Notes notes;
    try {
        const Time now = std::chrono::steady_clock::now();
        notes = incoming_.tick(now);
        std::ranges::move(outgoing_.tick(now), std::back_inserter(notes));
    } catch (...) {
        logLoss();
    }
    return notes;
}

// Where a client wants its answer; none unless that is below its request channel's answer prefix,
// so that no client can have messages sent to other channels.
std::optional<ReturnAddress> LongMessages::addressOf(const std::string& channel,
                                                     natsMsg* received) const {
    const char* const reply = natsMsg_GetReply(received);
    const std::string& prefix = options_.answerPrefixes.at(channel);
    const std::string_view answers = reply != nullptr ? reply : "";
    if (!answers.starts_with(prefix)) {
        return std::nullopt;
    }
    ReturnAddress address{std::string(answers.substr(prefix.size())), std::string(answers)};
    try {
        requireSubject(piecesPrefix + worker_ + "." + address.id);
        requireSubject(address.channel);
    } catch (const std::exception&) {
        return std::nullopt;
    }
    return address;
}

// While the result lives, answers on the channel may go in pieces.
std::shared_ptr<const void> LongMessages::expectAnswer(const ReturnAddress& address) {
    auto expectation = std::make_shared<Expectation>(weak_from_this());
    const std::lock_guard lock(mutex_);
    expectation->begin(*this, address);
    return expectation;
}

void LongMessages::sendAll(const Notes& notes) {
    for (const Note& note : notes) {
        try {
            send_(note);
        } catch (const std::exception& error) {
            // The client gets no answer and asks again.
            logger().warn("A piece of a message was not sent: {}", error.what());
            return;
        }
    }
}

// Called when memory is given back, with or without the mutex held.
void LongMessages::onRoom() {
    hasRoom_ = true;
    timerWakes_.notify_one();
}

}  // namespace platform::messaging::nats
