// SPDX-License-Identifier: Apache-2.0
// The worker's end of messages that travel in pieces: it reads the protocol's messages (pieces.h)
// from the servers and passes them to the transfers of both directions.
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>

#include "platform/data_buffer.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/delivery_threads.h"
#include "platform/messaging/memory_budget.h"
#include "platform/messaging/nats/incoming_transfers.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/nats/nats_source.h"
#include "platform/messaging/nats/outgoing_transfers.h"
#include "platform/messaging/nats/pieces.h"

namespace platform::messaging::nats {

/// Any thread may call its operations. None of them waits for a client, or for a server but in
/// `send`.
class LongMessages : public std::enable_shared_from_this<LongMessages> {
public:
    /// Sends a message with the header of pieces. What it throws is logged and dropped.
    using Send = std::function<void(const Note&)>;

    /// `send` is called by several threads at once, until `close` has returned.
    LongMessages(const LongMessageOptions& options, Send send);
    LongMessages(const LongMessages&) = delete;
    LongMessages& operator=(const LongMessages&) = delete;
    ~LongMessages();

    /// Starts the thread that sends pieces and notices what stands still, unless it runs already or
    /// `close` was called.
    void start();

    /// The subject on which clients speak to this worker alone.
    std::string subject() const { return piecesPrefix + worker_ + ".>"; }

    /// Handles what comes on `subject`. Must be called by one thread at a time.
    void takeWord(natsMsg* received);

    /// Whether requests on `channel` may be long.
    bool areLong(const std::string& channel) const {
        return options_.answerPrefixes.contains(channel);
    }

    /// Handles what comes where requests on `channel` are offered.
    void takeOffer(const std::string& channel, natsMsg* received);

    /// While the result lives, the answer to a short request on `channel` may go in pieces if its
    /// client takes them.
    std::shared_ptr<const void> takeRequest(const std::string& channel, natsMsg* received);

    /// The source of the complete requests on `channel`.
    std::shared_ptr<MessageSource> wholeRequests(const std::string& channel);

    /// How long an answer on `channel` may be; none when no request is being handled whose client
    /// takes pieces there.
    std::optional<std::size_t> longestAnswer(const std::string& channel);

    /// Keeps `payload` for the client that takes pieces on `channel`. Returns false, and leaves it,
    /// when there is none, or it is short enough for one piece.
    bool publish(const std::string& channel, DataBuffer& payload);

    /// Takes no more offers, has unfinished ones repeated at other workers, and waits until the
    /// requests that are whole have been handled and the clients have taken their answers. Returns
    /// false when `deadline` comes first.
    bool drain(Time deadline);

    /// Ends all transfers, and the thread.
    void close();

private:
    class Expectation;
    class WholeRequests;

    void runTimer();
    Notes tick() noexcept;
    std::optional<ReturnAddress> addressOf(const std::string& channel, natsMsg* received) const;
    std::shared_ptr<const void> expectAnswer(const ReturnAddress& address);
    void sendAll(const Notes& notes);
    void onRoom();

    const LongMessageOptions options_;
    const std::string worker_;
    const Send send_;
    MemoryBudget incomingMemory_;
    MemoryBudget outgoingMemory_;
    std::atomic<bool> hasRoom_ = false;  // memory has become free since the timer last looked

    std::mutex mutex_;                    // guards what follows
    std::condition_variable changed_;     // a request is whole, or a transfer has ended
    std::condition_variable timerWakes_;  // there is a transfer, or room for one
    IncomingTransfers incoming_;
    OutgoingTransfers outgoing_;
    std::map<std::string, std::deque<WholeRequest>> whole_;  // to be handled, by channel
    std::multimap<std::string, ReturnAddress> expected_;     // answers, by channel
    int sending_ = 0;  // client messages whose replies are not all sent yet
    bool refusing_ = false;
    bool closed_ = false;
    std::thread timer_;

    const std::shared_ptr<Subscription> roomWatch_;
};

}  // namespace platform::messaging::nats
