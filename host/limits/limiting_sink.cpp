// SPDX-License-Identifier: Apache-2.0
#include "host/limits/limiting_sink.h"

#include <simdjson.h>

#include <string_view>

#include "platform/text/quoted.h"

namespace host {

namespace {

// The longest line in bytes: with the names of logger and level it stays below 2 KB.
constexpr std::size_t longestText = 2000;
constexpr std::string_view cutMark = "...";

bool isControl(std::string_view character) {
    const auto first = static_cast<unsigned char>(character[0]);
    // The second range is that of the C1 controls, of two bytes in UTF-8.
    return first < 0x20 || first == 0x7F ||
           (first == 0xC2 && static_cast<unsigned char>(character[1]) < 0xA0);
}

// The character of UTF-8 that `text` begins with; empty when its first byte begins none.
std::string_view firstCharacter(std::string_view text) {
    const auto first = static_cast<unsigned char>(text[0]);
    const std::size_t length = first < 0x80 ? 1 : first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
    const std::string_view character = text.substr(0, length);
    return simdjson::validate_utf8(character.data(), character.size()) ? character
                                                                       : std::string_view();
}

std::string escaped(std::string_view bytes) {
    std::string text;
    for (const char byte : bytes) {
        text += platform::text::escapedByte(byte);
    }
    return text;
}

}  // namespace

std::string asLine(std::string_view text) {
    std::string line;
    std::size_t lengthIfCut = 0;  // The length that leaves room for the mark.
    while (!text.empty()) {
        const std::string_view character = firstCharacter(text);
        const std::string_view bytes = character.empty() ? text.substr(0, 1) : character;
        line += character.empty() || isControl(character) ? escaped(bytes) : std::string(bytes);
        if (line.size() > longestText) {
            return line.substr(0, lengthIfCut).append(cutMark);
        }
        if (line.size() + cutMark.size() <= longestText) {
            lengthIfCut = line.size();
        }
        text.remove_prefix(bytes.size());
    }
    return line;
}

LimitingSink::LimitingSink(std::shared_ptr<spdlog::sinks::sink> next, std::size_t lines,
                           std::chrono::milliseconds period)
    : next_(std::move(next)), lines_(lines), length_(period) {}

void LimitingSink::sink_it_(const spdlog::details::log_msg& line) {
    endPeriods(line.time);
    const Kind kind(std::string(line.logger_name.data(), line.logger_name.size()), line.level);
    Period& period = periods_.try_emplace(kind, Period{line.time}).first->second;
    if (period.passed == lines_) {
        ++period.leftOut;
        return;
    }
    ++period.passed;
    const std::string text = asLine({line.payload.data(), line.payload.size()});
    spdlog::details::log_msg shown = line;
    shown.payload = text;
    next_->log(shown);
}

void LimitingSink::flush_() {
    for (auto& [kind, period] : periods_) {
        tell(kind, std::exchange(period.leftOut, 0));
    }
    next_->flush();
}

void LimitingSink::endPeriods(TimePoint now) {
    for (auto each = periods_.begin(); each != periods_.end();) {
        const auto& [kind, period] = *each;
        // The clock may have been set back.
        if (now >= period.start && now < period.start + length_) {
            ++each;
            continue;
        }
        tell(kind, period.leftOut);
        each = periods_.erase(each);
    }
}

void LimitingSink::tell(const Kind& kind, std::size_t leftOut) {
    if (leftOut == 0) {
        return;
    }
    const std::string text = "lines like these that were left out: " + std::to_string(leftOut);
    next_->log(spdlog::details::log_msg(kind.first, kind.second, text));
}

void LimitingSink::set_pattern_(const std::string& pattern) {
    next_->set_pattern(pattern);
}

void LimitingSink::set_formatter_(std::unique_ptr<spdlog::formatter> formatter) {
    next_->set_formatter(std::move(formatter));
}

}  // namespace host
