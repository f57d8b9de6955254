// SPDX-License-Identifier: Apache-2.0
// The messages of the protocol between a client and a worker for a message that travels in pieces,
// and what both directions share (docs/protocol.md, "Long messages in pieces").
//
//   Zpr-Pieces: <word>[ <argument>]...
//
//   from the client              from the worker
//   yes                          room <worker> <end>
//   offer <length>               answer <worker> <length>
//   piece <offset>  + bytes      piece <offset>  + bytes
//   room <end>                   stop <reason>
//   stop
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace platform::messaging::nats {

/// The header that holds the words.
inline constexpr const char* piecesHeader = "Zpr-Pieces";

/// The longest piece.
inline constexpr std::size_t pieceSize = std::size_t{1} << 20;

/// How far a sender may be ahead of its receiver: enough to keep a fast line busy, and no more than
/// servers may hold for a receiver that stops. Twice as much made documents hardly faster, and had
/// servers cut off lines that were too slow to take it within the time they give for a write.
inline constexpr std::size_t windowSize = 4 * pieceSize;

/// What a client says.
struct ClientWord {
    enum class Kind { yes, offer, piece, room, stop };

    Kind kind;
    std::uint64_t number = 0;  ///< The length, offset or end; 0 for words without an argument.
};

/// The word in `header`; none when clients send no such word, or its arguments are wrong.
std::optional<ClientWord> parseClientWord(std::string_view header);

/// Where the answer to a request goes: the client's id, and the channel with which it ends.
struct ReturnAddress {
    std::string id;
    std::string channel;

    /// The user of the request: what precedes the first dot of the id.
    std::string user() const { return id.substr(0, id.find('.')); }
};

/// A message that a transfer wants sent. The payload is valid as long as `owner` lives.
struct Note {
    std::string subject;
    std::string word;
    std::string_view payload;
    std::shared_ptr<const void> owner;
};

using Notes = std::vector<Note>;

/// Tells the client at `address` that a transfer has ended unfinished.
Note stopNote(const ReturnAddress& address, std::string_view reason);

/// A count of memory in use, given back when this is destroyed.
using Reservation = std::shared_ptr<const void>;

/// Counts the bytes as in use; null when there is no room for them.
using Reserve = std::function<Reservation(std::size_t bytes)>;

using Time = std::chrono::steady_clock::time_point;

/// The bytes that count as progress of a transfer, so that a byte now and then does not keep its
/// memory.
inline constexpr std::size_t leastProgress = std::size_t{64} << 10;

/// How long a transfer may make no progress: when nobody waits for its memory, and when somebody
/// does.
inline constexpr std::chrono::seconds longestStandstill{30};
inline constexpr std::chrono::seconds longestStandstillInTheWay{5};

}  // namespace platform::messaging::nats
