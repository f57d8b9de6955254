// SPDX-License-Identifier: Apache-2.0
// Requests that come in pieces. A state machine without clock, threads or network: events come in
// as calls, and their results are the messages to send.
//
//   client                                  worker
//     offer 9000000          ------------>    there is no memory for it yet: it waits
//                            <------------  room <worker> 0         again every five seconds
//                            <------------  room <worker> 4194304   its memory is reserved
//     piece 0, 1 MiB         ------------>
//     piece 1048576, 1 MiB   ------------>
//                            <------------  room <worker> 5242880
//     ...
//     piece 8388608, the rest ----------->    complete: it is handled
//
// Either may send "stop" at any time. A piece out of turn or past the room, and a transfer that
// stands still, end with "stop": nothing is handled and the memory is free again.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/data_buffer.h"
#include "platform/messaging/nats/pieces.h"

namespace platform::messaging::nats {

/// How long an offer that does not fit waits while others go first.
inline constexpr std::chrono::seconds longestOvertaking{10};

/// A request that has come whole.
struct WholeRequest {
    std::string channel;
    ReturnAddress address;
    std::shared_ptr<const DataBuffer> payload;
    Reservation reservation;  ///< For the payload.
};

/// Those whose turn it is have their memory reserved whole, so that nobody fills memory with halves
/// of requests. The others wait; when there is memory, the users take turns, and of each user the
/// first offer that fits is next. One that would be overtaken for longer than `longestOvertaking`
/// is not overtaken any more. Belongs to one thread at a time.
class IncomingTransfers {
public:
    struct Limits {
        std::size_t longestRequest = std::size_t{1} << 30;
        std::size_t mostOffers = 4096;
        std::size_t mostOffersOfAUser = 1024;

        /// How many bytes all clients together may have on the way: less than a server holds for a
        /// worker.
        std::size_t mostAhead = std::size_t{128} << 20;
    };

    /// `worker`: what names this worker in subjects.
    IncomingTransfers(std::string worker, Limits limits, Reserve reserve)
        : worker_(std::move(worker)), limits_(limits), reserve_(std::move(reserve)) {}

    /// A client offers a request of `length` bytes on `channel`. A client that repeats its offer
    /// gets its room again.
    Notes offer(const std::string& channel, const ReturnAddress& address, std::uint64_t length,
                Time now);

    struct Progress {
        Notes notes;
        std::optional<WholeRequest> request;
    };

    /// A piece has come for the offer `id`. What belongs to no offer is dropped.
    Progress piece(const std::string& id, std::uint64_t offset, std::string_view bytes, Time now);

    /// The client `id` has given up.
    Notes stop(const std::string& id, Time now);

    /// Memory may have become free.
    Notes admitWaiting(Time now);

    /// Must be called about every second: ends transfers that stand still, and reminds waiting
    /// clients that they still wait.
    Notes tick(Time now);

    /// Ends all of them.
    Notes stopAll(std::string_view reason);

    /// How many there are, waiting or not.
    std::size_t count() const noexcept { return transfers_.size(); }

private:
    struct Transfer {
        std::string channel;
        ReturnAddress address;
        std::size_t length = 0;
        std::shared_ptr<DataBuffer> payload;  // none while it waits
        Reservation reservation;
        std::size_t room = 0;      // up to where the client may send
        std::size_t progress = 0;  // the bytes that had come when it last made progress
        Time moved;
        Time told;
    };
    using Position = std::map<std::string, Transfer>::iterator;

    // The offers of a user that wait; never empty.
    struct Queue {
        std::deque<std::string> ids;
        Time since;  // when the first of them came to be the first
    };
    using Queues = std::map<std::string, Queue>;

    bool isFull(const std::string& user) const;
    void startOrQueue(Position offered, const std::string& user, Time now);
    bool start(Transfer& transfer, Time now);
    bool admitOneOf(Queues::iterator queue, Notes& notes, Time now);
    Queues::iterator mostOvertaken(Time now);
    void leave(Queues::iterator queue, std::deque<std::string>::iterator id, Time now);
    void remove(Position position, Time now);
    Note tellRoom(Transfer& transfer, Time now) const;
    std::size_t aheadOf(const Transfer& transfer) const;

    const std::string worker_;
    const Limits limits_;
    const Reserve reserve_;
    std::map<std::string, Transfer> transfers_;    // by the client's id
    Queues waiting_;                               // by user
    std::map<std::string, std::size_t> offersOf_;  // by user
    std::string lastUser_;                         // whose turn it was
    std::size_t ahead_ = 0;  // what the clients whose turn it is may be ahead, together
};

}  // namespace platform::messaging::nats
