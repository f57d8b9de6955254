// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/outgoing_transfers.h"

#include <algorithm>
#include <utility>

namespace platform::messaging::nats {
namespace {

// Pieces keep it until they are sent.
struct KeptAnswer {
    DataBuffer payload;
    Reservation reservation;
};

}  // namespace

Notes OutgoingTransfers::answer(const ReturnAddress& address, DataBuffer payload, Time now) {
    if (transfers_.contains(address.id)) {
        return {};
    }
    Notes notes;
    Reservation reservation = makeRoom(payload.length(), address.user(), notes, now);
    if (!reservation) {
        notes.push_back(stopNote(address, "too many answers wait to be taken"));
        return notes;
    }
    notes.push_back({address.channel,
                     "answer " + worker_ + " " + std::to_string(payload.length()),
                     {},
                     nullptr});
    const auto kept =
        std::make_shared<const KeptAnswer>(KeptAnswer{std::move(payload), std::move(reservation)});
    std::size_t& held = bytesOf_[address.user()];
    transfers_.emplace(address.id, Transfer{address, kept->payload.view(), kept, 0, 0, now});
    held += kept->payload.length();
    return notes;
}

Notes OutgoingTransfers::room(const std::string& id, std::uint64_t end, Time now) {
    const auto found = transfers_.find(id);
    if (found == transfers_.end()) {
        return {};
    }
    Transfer& transfer = found->second;
    const std::size_t length = transfer.payload.size();
    const auto until = static_cast<std::size_t>(
        std::min<std::uint64_t>({end, length, transfer.sent + windowSize}));
    Notes notes;
    while (transfer.sent < until) {
        const std::size_t size = std::min(pieceSize, until - transfer.sent);
        notes.push_back({transfer.address.channel, "piece " + std::to_string(transfer.sent),
                         transfer.payload.substr(transfer.sent, size), transfer.owner});
        transfer.sent += size;
    }
    if (transfer.sent >= transfer.progress + leastProgress) {
        transfer.progress = transfer.sent;
        transfer.moved = now;
    }
    if (transfer.sent == length) {
        remove(found);
    }
    return notes;
}

void OutgoingTransfers::stop(const std::string& id) {
    if (const auto found = transfers_.find(id); found != transfers_.end()) {
        remove(found);
    }
}

Notes OutgoingTransfers::tick(Time now) {
    Notes notes;
    for (auto next = transfers_.begin(); next != transfers_.end();) {
        const auto position = next++;
        if (now - position->second.moved >= longestStandstill) {
            giveUp(position, notes);
        }
    }
    return notes;
}

Notes OutgoingTransfers::stopAll(std::string_view reason) {
    Notes notes;
    while (!transfers_.empty()) {
        notes.push_back(stopNote(transfers_.begin()->second.address, reason));
        remove(transfers_.begin());
    }
    return notes;
}

Reservation OutgoingTransfers::makeRoom(std::size_t bytes, const std::string& user, Notes& notes,
                                        Time now) {
    for (;;) {
        Reservation reservation = reserve_(bytes);
        if (reservation) {
            return reservation;
        }
        const Position expendable = mostExpendable(bytes, user, now);
        if (expendable == transfers_.end()) {
            return nullptr;
        }
        giveUp(expendable, notes);
    }
}

// The transfer to give up for `bytes` of `user`: of those that have stood still for too long, or
// whose users have more waiting than this one would, the one that has stood still the longest.
OutgoingTransfers::Position OutgoingTransfers::mostExpendable(std::size_t bytes,
                                                              const std::string& user, Time now) {
    const auto held = bytesOf_.find(user);
    const std::size_t share = bytes + (held != bytesOf_.end() ? held->second : 0);
    Position result = transfers_.end();
    for (Position position = transfers_.begin(); position != transfers_.end(); ++position) {
        const Transfer& transfer = position->second;
        const bool isExpendable = now - transfer.moved >= longestStandstillInTheWay ||
                                  bytesOf_.at(transfer.address.user()) > share;
        if (isExpendable && (result == transfers_.end() || transfer.moved < result->second.moved)) {
            result = position;
        }
    }
    return result;
}

void OutgoingTransfers::giveUp(Position position, Notes& notes) {
    notes.push_back(stopNote(position->second.address, "the answer was not taken for too long"));
    remove(position);
}

void OutgoingTransfers::remove(Position position) {
    const auto held = bytesOf_.find(position->second.address.user());
    held->second -= position->second.payload.size();
    if (held->second == 0) {
        bytesOf_.erase(held);
    }
    transfers_.erase(position);
}

}  // namespace platform::messaging::nats
