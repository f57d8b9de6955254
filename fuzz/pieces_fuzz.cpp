// SPDX-License-Identifier: Apache-2.0
// What clients may say about messages in pieces, in any order and with any numbers: memory is
// counted right, no more is sent than there is room for, and a request is whole or is not handed
// on.
//
// Input: operations, each of a byte that says which and for which client, and two bytes of number.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/messaging/nats/incoming_transfers.h"
#include "platform/messaging/nats/outgoing_transfers.h"
#include "platform/messaging/nats/pieces.h"

namespace {

namespace nats = platform::messaging::nats;

constexpr std::size_t memorySize = 8 * nats::pieceSize;

void require(bool condition) {
    if (!condition) {
        std::abort();
    }
}

nats::Reserve countIn(std::size_t& used) {
    return [&used](std::size_t bytes) -> nats::Reservation {
        if (bytes > memorySize - used) {
            return nullptr;
        }
        used += bytes;
        return {&used, [&used, bytes](const void*) { used -= bytes; }};
    };
}

void requireBounded(const nats::Notes& notes) {
    std::size_t bytes = 0;
    for (const nats::Note& note : notes) {
        require(note.payload.size() <= nats::pieceSize);
        bytes += note.payload.size();
    }
    require(bytes <= nats::windowSize);
}

// One client's words, with numbers that are near to those that matter.
void speak(std::string_view operation, nats::IncomingTransfers& incoming,
           nats::OutgoingTransfers& outgoing, nats::Time& now) {
    const auto kind = static_cast<unsigned char>(operation[0]);
    const auto low = static_cast<unsigned char>(operation[1]);
    const auto high = static_cast<unsigned char>(operation[2]);
    const std::string id =
        std::string(1, static_cast<char>('a' + kind / 16 % 3)) + "." + std::to_string(kind / 64);
    const nats::ReturnAddress address{id, "/answer/" + id};
    const std::uint64_t number = std::uint64_t{high} * nats::pieceSize / 16 + low;
    switch (kind % 8) {
        case 0:
            incoming.offer("/ask", address, number, now);
            break;
        case 1:
        case 2: {
            const std::string piece(kind % 8 == 1 ? nats::pieceSize : low, 'x');
            const auto progress = incoming.piece(id, number - low, piece, now);
            require(!progress.request ||
                    progress.request->payload->length() == progress.request->payload->capacity());
            break;
        }
        case 3:
            outgoing.answer(address, platform::DataBuffer::copyOf(std::string(1 + number / 4, 'y')),
                            now);
            break;
        case 4:
            requireBounded(outgoing.room(id, high == 255 ? ~std::uint64_t{0} : number, now));
            break;
        case 5:
            incoming.stop(id, now);
            outgoing.stop(id);
            break;
        case 6:
            now += std::chrono::seconds(low % 8);
            incoming.tick(now);
            outgoing.tick(now);
            break;
        default:
            nats::parseClientWord(operation.substr(1));
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    nats::parseClientWord(input);
    std::size_t used = 0;
    {
        nats::Time now{};
        nats::IncomingTransfers incoming(
            "w", {.longestRequest = memorySize, .mostOffers = 8, .mostOffersOfAUser = 4},
            countIn(used));
        nats::OutgoingTransfers outgoing("w", countIn(used));
        for (std::size_t at = 0; at + 3 <= input.size() && at < 3 * 200; at += 3) {
            speak(input.substr(at, 3), incoming, outgoing, now);
            require(used <= memorySize);
            require(incoming.count() <= 8);
        }
        incoming.stopAll("the end");
        outgoing.stopAll("the end");
        require(used == 0 && incoming.count() == 0 && outgoing.count() == 0);
    }
    return 0;
}
