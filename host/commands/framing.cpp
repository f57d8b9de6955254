// SPDX-License-Identifier: Apache-2.0
#include "host/commands/framing.h"

#include <algorithm>
#include <charconv>
#include <cstring>
#include <system_error>
#include <utility>

#include "platform/text/case.h"
#include "platform/text/quoted.h"

namespace host {

namespace {

constexpr std::string_view channelHeader = "Channel";
constexpr std::string_view lengthHeader = "Content-Length";
constexpr std::string_view blanks = " \t";
constexpr int endOfInput = -1;
constexpr std::size_t bufferSize = std::size_t{64} * 1024;
// A payload's buffer starts with at most this size, and doubles as its bytes arrive.
constexpr std::size_t firstPayloadPiece = std::size_t{1024} * 1024;

std::string_view withoutLeadingBlanks(std::string_view text) {
    return text.substr(std::min(text.find_first_not_of(blanks), text.size()));
}

// `text` in quotes for a message to a terminal: shortened, and without control characters.
std::string quoted(std::string_view text) {
    constexpr std::size_t longest = 60;
    return '"' + platform::text::printable(text, longest) + '"';
}

}  // namespace

struct FrameReader::Headers {
    std::optional<std::string> channel;
    std::optional<std::size_t> length;
};

FrameReader::FrameReader(ByteSource source, std::size_t maxPayload)
    : source_(std::move(source)), maxPayload_(maxPayload), buffer_(bufferSize) {}

std::optional<Frame> FrameReader::next() {
    if (nextByte() == endOfInput) {
        return std::nullopt;
    }
    --used_;  // The byte belongs to the frame's first line.
    Headers headers = readHeaders();
    Frame frame{std::move(*headers.channel), readPayload(*headers.length)};
    ++framesRead_;
    return frame;
}

int FrameReader::nextByte() {
    if (used_ == filled_) {
        used_ = 0;
        filled_ = source_(buffer_.data(), buffer_.size());
        if (filled_ == 0) {
            return endOfInput;
        }
    }
    return static_cast<unsigned char>(buffer_[used_++]);
}

FrameReader::Headers FrameReader::readHeaders() {
    Headers headers;
    while (const std::optional<std::string> line = readHeaderLine()) {
        readHeader(*line, headers);
    }
    if (!headers.channel) {
        fail("it has no Channel header");
    }
    if (!headers.length) {
        fail("it has no Content-Length header");
    }
    return headers;
}

// The next line without its line end; nothing for the empty line after the headers.
std::optional<std::string> FrameReader::readHeaderLine() {
    std::string line;
    for (;;) {
        const int byte = nextByte();
        if (byte == endOfInput) {
            fail("the input ends in its headers");
        }
        if (byte == '\n') {
            fail("a header line ends in LF, not in CR LF");
        }
        if (byte == '\r') {
            break;
        }
        if (line.size() == maxHeaderLine) {
            fail("a header line is longer than " + std::to_string(maxHeaderLine) + " bytes");
        }
        line += static_cast<char>(byte);
    }
    const int byte = nextByte();
    if (byte == endOfInput) {
        fail("the input ends in its headers");
    }
    if (byte != '\n') {
        fail("a header line has a CR that no LF follows");
    }
    return line.empty() ? std::nullopt : std::optional(std::move(line));
}

void FrameReader::readHeader(std::string_view line, Headers& headers) const {
    const std::size_t colon = line.find(':');
    if (colon == std::string_view::npos) {
        fail("header line " + quoted(line) + " has no colon");
    }
    const std::string_view name = line.substr(0, colon);
    const std::string_view value = withoutLeadingBlanks(line.substr(colon + 1));
    if (platform::text::equalIgnoringCase(name, channelHeader)) {
        if (headers.channel) {
            fail("it has two Channel headers");
        }
        if (value.empty()) {
            fail("its Channel is empty");
        }
        headers.channel = value;
    } else if (platform::text::equalIgnoringCase(name, lengthHeader)) {
        if (headers.length) {
            fail("it has two Content-Length headers");
        }
        headers.length = parseLength(value);
    } else {
        fail("header " + quoted(name) + " is not known");
    }
}

std::size_t FrameReader::parseLength(std::string_view digits) const {
    std::size_t length = 0;
    const char* const end = digits.data() + digits.size();
    const auto [stop, error] = std::from_chars(digits.data(), end, length);
    if (error == std::errc::invalid_argument || stop != end) {
        fail("its Content-Length " + quoted(digits) + " is not a decimal number");
    }
    if (error == std::errc::result_out_of_range || length > maxPayload_) {
        fail("its Content-Length " + quoted(digits) + " is above the limit of " +
             std::to_string(maxPayload_) + " bytes");
    }
    return length;
}

platform::DataBuffer FrameReader::readPayload(std::size_t length) {
    platform::DataBuffer payload(std::min(length, firstPayloadPiece));
    for (;;) {
        const std::size_t have = payload.length();
        const std::size_t count =
            readPayloadBytes(payload.data() + have, payload.capacity() - have);
        payload.setLength(have + count);
        if (payload.length() < payload.capacity()) {
            fail("the input ends after " + std::to_string(payload.length()) + " of the " +
                 std::to_string(length) + " bytes of its payload");
        }
        if (payload.length() == length) {
            return payload;
        }
        platform::DataBuffer larger(std::min(length, 2 * payload.capacity()));
        std::memcpy(larger.data(), payload.data(), payload.length());
        larger.setLength(payload.length());
        payload = std::move(larger);
    }
}

// Reads `count` bytes, or fewer where the input ends. Bytes that are not in the buffer yet are read
// straight into place.
std::size_t FrameReader::readPayloadBytes(char* to, std::size_t count) {
    std::size_t have = std::min(count, filled_ - used_);
    if (have > 0) {
        std::memcpy(to, buffer_.data() + used_, have);
        used_ += have;
    }
    while (have < count) {
        const std::size_t more = source_(to + have, count - have);
        if (more == 0) {
            break;
        }
        have += more;
    }
    return have;
}

void FrameReader::fail(const std::string& reason) const {
    throw FramingError("message " + std::to_string(framesRead_ + 1) +
                       " of the input is not framed rightly: " + reason);
}

std::string frameHeaders(std::string_view channel, std::size_t length) {
    const std::size_t longestChannel = maxHeaderLine - channelHeader.size() - 2;
    if (channel.empty() || blanks.find(channel.front()) != std::string_view::npos ||
        channel.size() > longestChannel ||
        channel.find_first_of("\r\n") != std::string_view::npos) {
        throw std::invalid_argument("channel " + quoted(channel) + " cannot stand in a frame");
    }
    std::string headers;
    headers.append(channelHeader).append(": ").append(channel).append("\r\n");
    headers.append(lengthHeader).append(": ").append(std::to_string(length)).append("\r\n\r\n");
    return headers;
}

}  // namespace host
