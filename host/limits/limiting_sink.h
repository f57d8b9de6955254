// SPDX-License-Identifier: Apache-2.0
// Keeps a log readable and bounded, since clients can cause a line for each message, with text of
// theirs in it.
#pragma once

#include <spdlog/sinks/base_sink.h>

#include <chrono>
#include <cstddef>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>

namespace host {

/// `text` as one line of at most 2000 bytes: what is longer is cut, and controls (line breaks, the
/// escapes that terminals obey) and bytes that are not UTF-8 are written as \xNN.
std::string asLine(std::string_view text);

/// Passes log lines on to another sink, but only so many in a period of time from one logger at one
/// level; the lines beyond are left out and counted. Their number is logged, as
/// one more line of that logger and level, with the first line of any kind after the period, or by
/// a flush. So a flood of one kind does not hide lines of another.
///
/// Each text becomes one line, as asLine makes it.
///
/// A period begins with the first line after the previous period. Its times are those of the lines.
class LimitingSink final : public spdlog::sinks::base_sink<std::mutex> {
public:
    /// At most `lines` in `period` go to `next`.
    LimitingSink(std::shared_ptr<spdlog::sinks::sink> next, std::size_t lines,
                 std::chrono::milliseconds period);

private:
    using TimePoint = spdlog::log_clock::time_point;
    using Kind = std::pair<std::string, spdlog::level::level_enum>;

    struct Period {
        TimePoint start;
        std::size_t passed = 0;
        std::size_t leftOut = 0;
    };

    void sink_it_(const spdlog::details::log_msg& line) override;
    void flush_() override;
    void set_pattern_(const std::string& pattern) override;
    void set_formatter_(std::unique_ptr<spdlog::formatter> formatter) override;

    void endPeriods(TimePoint now);
    void tell(const Kind& kind, std::size_t leftOut);

    const std::shared_ptr<spdlog::sinks::sink> next_;
    const std::size_t lines_;
    const std::chrono::milliseconds length_;
    std::map<Kind, Period>
        periods_;  // periods that have not ended; at most one for each logger and level
};

}  // namespace host
