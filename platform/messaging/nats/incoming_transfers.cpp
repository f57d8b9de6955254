// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/incoming_transfers.h"

#include <algorithm>
#include <cstring>
#include <exception>
#include <utility>

namespace platform::messaging::nats {
namespace {

// How often a waiting client is reminded that it is still waiting.
constexpr std::chrono::seconds reminderInterval{5};

}  // namespace

Notes IncomingTransfers::offer(const std::string& channel, const ReturnAddress& address,
                               std::uint64_t length, Time now) {
    if (const auto known = transfers_.find(address.id); known != transfers_.end()) {
        Transfer& transfer = known->second;
        if (transfer.channel != channel || transfer.length != length) {
            return {stopNote(address, "another offer has this id")};
        }
        return {tellRoom(transfer, now)};
    }
    if (length == 0 || length > limits_.longestRequest) {
        return {stopNote(
            address, "requests have 1 to " + std::to_string(limits_.longestRequest) + " bytes")};
    }
    const std::string user = address.user();
    if (isFull(user)) {
        return {stopNote(address, "too many offers wait")};
    }
    Transfer transfer;
    transfer.channel = channel;
    transfer.address = address;
    transfer.length = static_cast<std::size_t>(length);
    std::size_t& offers = offersOf_[user];
    const Position added = transfers_.emplace(address.id, std::move(transfer)).first;
    ++offers;
    try {
        startOrQueue(added, user, now);
    } catch (...) {  // there is no memory: it is neither started nor queued
        transfers_.erase(added);
        --offers;
        throw;
    }
    return {tellRoom(added->second, now)};
}

void IncomingTransfers::startOrQueue(Position offered, const std::string& user, Time now) {
    const auto queue = waiting_.find(user);
    if (queue != waiting_.end()) {
        queue->second.ids.push_back(offered->first);
    } else if (mostOvertaken(now) != waiting_.end() || !start(offered->second, now)) {
        waiting_.emplace(user, Queue{{offered->first}, now});
    }
}

IncomingTransfers::Progress IncomingTransfers::piece(const std::string& id, std::uint64_t offset,
                                                     std::string_view bytes, Time now) {
    const auto found = transfers_.find(id);
    if (found == transfers_.end()) {
        return {};
    }
    Transfer& transfer = found->second;
    const std::size_t received = transfer.payload ? transfer.payload->length() : 0;
    if (offset != received || bytes.empty() || bytes.size() > pieceSize ||
        bytes.size() > transfer.room - received) {
        Progress progress{{stopNote(transfer.address, "a piece is out of turn")}, {}};
        remove(found, now);
        std::ranges::move(admitWaiting(now), std::back_inserter(progress.notes));
        return progress;
    }
    std::memcpy(transfer.payload->data() + received, bytes.data(), bytes.size());
    transfer.payload->setLength(received + bytes.size());
    if (received + bytes.size() == transfer.length) {
        WholeRequest request{transfer.channel, transfer.address, std::move(transfer.payload),
                             std::move(transfer.reservation)};
        remove(found, now);
        return {admitWaiting(now), std::move(request)};
    }
    if (received + bytes.size() >= transfer.progress + leastProgress) {
        transfer.progress = received + bytes.size();
        transfer.moved = now;
    }
    const std::size_t room = std::min(transfer.length, received + bytes.size() + windowSize);
    // Not for every piece when pieces are small.
    if (room == transfer.room || (room < transfer.room + pieceSize && room != transfer.length)) {
        return {};
    }
    transfer.room = room;
    return {{tellRoom(transfer, now)}, {}};
}

Notes IncomingTransfers::stop(const std::string& id, Time now) {
    const auto found = transfers_.find(id);
    if (found == transfers_.end()) {
        return {};
    }
    remove(found, now);
    return admitWaiting(now);
}

// One of each user in turn, until nothing more fits, or somebody has been overtaken for too long.
Notes IncomingTransfers::admitWaiting(Time now) {
    Notes notes;
    for (auto first = mostOvertaken(now); first != waiting_.end(); first = mostOvertaken(now)) {
        Transfer& transfer = transfers_.at(first->second.ids.front());
        if (!start(transfer, now)) {
            return notes;
        }
        leave(first, first->second.ids.begin(), now);
        notes.push_back(tellRoom(transfer, now));
    }
    std::size_t refused = 0;
    while (refused < waiting_.size()) {
        auto next = waiting_.upper_bound(lastUser_);
        if (next == waiting_.end()) {
            next = waiting_.begin();
        }
        lastUser_ = next->first;
        refused = admitOneOf(next, notes, now) ? 0 : refused + 1;
    }
    return notes;
}

bool IncomingTransfers::admitOneOf(Queues::iterator queue, Notes& notes, Time now) {
    std::deque<std::string>& ids = queue->second.ids;
    const auto first = std::ranges::find_if(
        ids, [&](const std::string& id) { return start(transfers_.at(id), now); });
    if (first == ids.end()) {
        return false;
    }
    Transfer& started = transfers_.at(*first);
    leave(queue, first, now);
    notes.push_back(tellRoom(started, now));
    return true;
}

// The user whose first offer has waited for the longest, if that is too long. Counted from when it
// became the first, so that a user with many offers does not shut out the others with them.
IncomingTransfers::Queues::iterator IncomingTransfers::mostOvertaken(Time now) {
    const auto first = std::ranges::min_element(
        waiting_, {}, [](const Queues::value_type& each) { return each.second.since; });
    return first != waiting_.end() && now - first->second.since >= longestOvertaking
               ? first
               : waiting_.end();
}

// Takes `id` out of `queue`.
void IncomingTransfers::leave(Queues::iterator queue, std::deque<std::string>::iterator id,
                              Time now) {
    std::deque<std::string>& ids = queue->second.ids;
    if (id == ids.begin()) {
        queue->second.since = now;
    }
    ids.erase(id);
    if (ids.empty()) {
        waiting_.erase(queue);
    }
}

// Reserves what `transfer` needs; false when there is not enough.
bool IncomingTransfers::start(Transfer& transfer, Time now) {
    if (ahead_ + aheadOf(transfer) > limits_.mostAhead) {
        return false;
    }
    Reservation reservation = reserve_(transfer.length);
    if (!reservation) {
        return false;
    }
    try {
        transfer.payload = std::make_shared<DataBuffer>(transfer.length);
    } catch (const std::exception&) {
        return false;  // the system has less memory than expected
    }
    transfer.reservation = std::move(reservation);
    transfer.room = aheadOf(transfer);
    transfer.moved = now;
    ahead_ += aheadOf(transfer);
    return true;
}

Notes IncomingTransfers::tick(Time now) {
    Notes notes;
    const auto standstill = waiting_.empty() ? longestStandstill : longestStandstillInTheWay;
    for (auto next = transfers_.begin(); next != transfers_.end();) {
        const auto position = next++;
        Transfer& transfer = position->second;
        if (!transfer.payload) {
            if (now - transfer.told >= reminderInterval) {
                notes.push_back(tellRoom(transfer, now));
            }
        } else if (now - transfer.moved >= standstill) {
            notes.push_back(stopNote(transfer.address, "nothing came for too long"));
            remove(position, now);
        }
    }
    std::ranges::move(admitWaiting(now), std::back_inserter(notes));
    return notes;
}

Notes IncomingTransfers::stopAll(std::string_view reason) {
    Notes notes;
    for (const auto& [id, transfer] : transfers_) {
        notes.push_back(stopNote(transfer.address, reason));
    }
    transfers_.clear();
    waiting_.clear();
    offersOf_.clear();
    ahead_ = 0;
    return notes;
}

bool IncomingTransfers::isFull(const std::string& user) const {
    const auto offers = offersOf_.find(user);
    return transfers_.size() >= limits_.mostOffers ||
           (offers != offersOf_.end() && offers->second >= limits_.mostOffersOfAUser);
}

void IncomingTransfers::remove(Position position, Time now) {
    const Transfer& transfer = position->second;
    const std::string user = transfer.address.user();
    if (transfer.room > 0) {
        ahead_ -= aheadOf(transfer);
    } else if (const auto queue = waiting_.find(user); queue != waiting_.end()) {
        leave(queue, std::ranges::find(queue->second.ids, position->first), now);
    }
    if (const auto offers = offersOf_.find(user); --offers->second == 0) {
        offersOf_.erase(offers);
    }
    transfers_.erase(position);
}

Note IncomingTransfers::tellRoom(Transfer& transfer, Time now) const {
    transfer.told = now;
    return {transfer.address.channel,
            "room " + worker_ + " " + std::to_string(transfer.room),
            {},
            nullptr};
}

std::size_t IncomingTransfers::aheadOf(const Transfer& transfer) const {
    return std::min(transfer.length, windowSize);
}

}  // namespace platform::messaging::nats
