// SPDX-License-Identifier: Apache-2.0
// Any bytes on the host's standard input, in pieces of any sizes: they give the same frames however
// they come, and each frame that is read can be written and read again.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/commands/framing.h"

namespace {

constexpr std::size_t maxPayload = 5000;

struct Outcome {
    std::vector<std::pair<std::string, std::string>> frames;
    std::string error;
    bool operator==(const Outcome&) const = default;
};

// Reads the frames of `input`, of which each read gives at most `piece` bytes.
Outcome readFrames(std::string_view input, std::size_t piece) {
    host::FrameReader reader(
        [&](char* to, std::size_t room) {
            const std::size_t count = std::min({room, piece, input.size()});
            if (count > 0) {
                std::memcpy(to, input.data(), count);
            }
            input.remove_prefix(count);
            return count;
        },
        maxPayload);
    Outcome outcome;
    try {
        while (const std::optional<host::Frame> frame = reader.next()) {
            outcome.frames.emplace_back(frame->channel, frame->payload.view());
        }
    } catch (const host::FramingError& error) {
        outcome.error = error.what();
    }
    return outcome;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0) {
        return 0;
    }
    const std::string_view input(reinterpret_cast<const char*>(data) + 1, size - 1);
    const Outcome outcome = readFrames(input, input.size() + 1);
    if (readFrames(input, data[0] % 7U + 1) != outcome) {
        std::abort();
    }
    std::string written;
    for (const auto& [channel, payload] : outcome.frames) {
        written += host::frameHeaders(channel, payload.size()) + payload;
    }
    if (readFrames(written, written.size() + 1) != Outcome{outcome.frames, {}}) {
        std::abort();
    }
    return 0;
}
