// A part of a file from which its charset can be told.
#include "platform/i18n/sample.h"

#include <algorithm>

namespace platform::i18n::detail {

namespace {

constexpr std::size_t wholeFileLimit = 24 * 1024;
constexpr std::size_t pieceCount = 16;
constexpr std::size_t pieceSize = wholeFileLimit / pieceCount;
constexpr std::size_t boundarySearch = 16 * 1024;

bool isBeyondAscii(char byte) {
    return static_cast<unsigned char>(byte) >= 0x80;
}

// Bytes below '0' are in no charset a part of a character of several bytes.
bool isBoundary(char byte) {
    return static_cast<unsigned char>(byte) < 0x30;
}

std::size_t findBeyondAscii(std::string_view bytes, std::size_t from) {
    const auto found =
        std::find_if(bytes.begin() + static_cast<std::ptrdiff_t>(from), bytes.end(), isBeyondAscii);
    return static_cast<std::size_t>(found - bytes.begin());
}

// The boundary before `position`, or npos when there is none near.
std::size_t boundaryBefore(std::string_view bytes, std::size_t position, std::size_t lowest) {
    const std::size_t limit = std::max(lowest, position - std::min(position, boundarySearch));
    for (std::size_t i = position; i > limit; --i) {
        if (isBoundary(bytes[i - 1])) {
            return i;
        }
    }
    return limit == 0 || limit == lowest ? limit : std::string_view::npos;
}

std::size_t boundaryAfter(std::string_view bytes, std::size_t position) {
    const std::size_t limit = std::min(bytes.size(), position + boundarySearch);
    for (std::size_t i = position; i < limit; ++i) {
        if (isBoundary(bytes[i])) {
            return i;
        }
    }
    return limit == bytes.size() ? limit : std::string_view::npos;
}

}  // namespace

std::string charsetSample(std::string_view bytes) {
    if (bytes.size() <= wholeFileLimit) {
        return std::string(bytes);
    }
    std::string sample;
    std::size_t done = 0;
    for (std::size_t i = 0; i < pieceCount; ++i) {
        const std::size_t from = std::max(done, bytes.size() / pieceCount * i);
        const std::size_t position = findBeyondAscii(bytes, from);
        if (position == bytes.size()) {
            break;
        }
        const std::size_t begin = boundaryBefore(bytes, position, done);
        const std::size_t end = boundaryAfter(bytes, std::min(bytes.size(), position + pieceSize));
        if (begin == std::string_view::npos || end == std::string_view::npos) {
            continue;
        }
        sample += bytes.substr(begin, end - begin);
        sample += '\n';
        done = end;
    }
    // Not one boundary in all of it: a text without a space or an end of line.
    return sample.empty() ? std::string(bytes.substr(0, boundarySearch)) : sample;
}

}  // namespace platform::i18n::detail
