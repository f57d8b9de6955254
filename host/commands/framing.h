// SPDX-License-Identifier: Apache-2.0
// The framing of messages on the host's standard input and output.
//
//     Channel: <channel>\r\n
//     Content-Length: <bytes>\r\n
//     \r\n
//     <payload>
//
// Each frame has both headers once, in either order. Their names are compared without case, and
// blanks between the colon and the value do not count; a value runs to the end of its line. A
// channel is any bytes but CR and LF, at least one, and the first is not a blank. A header line is
// at most maxHeaderLine bytes long. Any departure from this is an error: a stream that has lost its
// frames cannot be trusted to find them again.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "platform/data_buffer.h"

namespace host {

/// The longest header line of a frame in bytes, the line's end not counted.
inline constexpr std::size_t maxHeaderLine = std::size_t{64} * 1024;

/// One message with the channel that it goes to or came from.
struct Frame {
    std::string channel;
    platform::DataBuffer payload;
};

/// The input is not a sequence of frames. The text says which frame is wrong and how.
class FramingError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

/// Reads up to `room` bytes to `to` and returns how many; zero means the end of the input.
using ByteSource = std::function<std::size_t(char* to, std::size_t room)>;

/// Splits a stream of bytes into frames.
class FrameReader {
public:
    /// Reads from `source`; frames with a payload of more than `maxPayload` bytes are refused.
    FrameReader(ByteSource source, std::size_t maxPayload);

    /// The next frame, or nothing when the input ends where a frame may end. Memory is allocated as
    /// the payload's bytes arrive, not as its header promises. Throws FramingError, or what the
    /// source throws; the reader cannot be used after that.
    std::optional<Frame> next();

private:
    struct Headers;

    int nextByte();
    Headers readHeaders();
    std::optional<std::string> readHeaderLine();
    void readHeader(std::string_view line, Headers& headers) const;
    std::size_t parseLength(std::string_view digits) const;
    platform::DataBuffer readPayload(std::size_t length);
    std::size_t readPayloadBytes(char* to, std::size_t count);
    [[noreturn]] void fail(const std::string& reason) const;

    ByteSource source_;
    std::size_t maxPayload_;
    std::size_t framesRead_ = 0;
    // Bytes that have been read and not used: [used_, filled_) of buffer_.
    std::vector<char> buffer_;
    std::size_t used_ = 0;
    std::size_t filled_ = 0;
};

/// The headers, with the empty line after them, of a frame with `length` bytes of payload for
/// `channel`. Throws std::invalid_argument when no frame can carry that channel.
std::string frameHeaders(std::string_view channel, std::size_t length);

}  // namespace host
