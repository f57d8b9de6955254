// SPDX-License-Identifier: Apache-2.0
// Answers that leave in pieces. A state machine without clock, threads or network: events come in
// as calls, and their results are the messages to send.
//
//   worker                                  client
//     answer <worker> 9000000 ----------->
//                            <------------  room 4194304
//     piece 0, 1 MiB         ------------>
//     ... 3 more             ------------>
//                            <------------  room 6291456
//     piece 4194304, 1 MiB   ------------>
//     ...
//     piece 8388608, the rest ----------->    its memory is free again
//
// Either may send "stop" at any time. An answer that the client does not fetch ends with "stop".
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "platform/data_buffer.h"
#include "platform/messaging/nats/pieces.h"

namespace platform::messaging::nats {

/// Belongs to one thread at a time.
class OutgoingTransfers {
public:
    /// `worker`: what names this worker in subjects.
    OutgoingTransfers(std::string worker, Reserve reserve)
        : worker_(std::move(worker)), reserve_(std::move(reserve)) {}

    /// Keeps `payload`, which is not empty, for the client at `address` and announces it. When
    /// there is no memory for it, others are given up: those that have stood still for too long,
    /// and then those of a user who has more waiting than this one would. When that does not help,
    /// this client has to ask again. A second answer for the same client's id is dropped.
    Notes answer(const ReturnAddress& address, DataBuffer payload, Time now);

    /// The client `id` has room up to `end`. Sends at most `windowSize` bytes, so that a client
    /// that claims endless room does not make servers hold a document for it.
    Notes room(const std::string& id, std::uint64_t end, Time now);

    /// The client `id` has given up.
    void stop(const std::string& id);

    /// Must be called about every second: ends transfers that stand still.
    Notes tick(Time now);

    /// Ends all of them.
    Notes stopAll(std::string_view reason);

    /// How many there are.
    std::size_t count() const noexcept { return transfers_.size(); }

private:
    struct Transfer {
        ReturnAddress address;
        std::string_view payload;
        std::shared_ptr<const void> owner;  // of the payload and of its reservation
        std::size_t sent = 0;
        std::size_t progress = 0;  // the bytes that had been sent when it last made progress
        Time moved;
    };
    using Position = std::map<std::string, Transfer>::iterator;

    Reservation makeRoom(std::size_t bytes, const std::string& user, Notes& notes, Time now);
    Position mostExpendable(std::size_t bytes, const std::string& user, Time now);
    void giveUp(Position position, Notes& notes);
    void remove(Position position);

    const std::string worker_;
    const Reserve reserve_;
    std::map<std::string, Transfer> transfers_;   // by the client's id
    std::map<std::string, std::size_t> bytesOf_;  // that wait, by user
};

}  // namespace platform::messaging::nats
