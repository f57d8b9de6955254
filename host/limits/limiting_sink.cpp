// SPDX-License-Identifier: Apache-2.0
#include "host/limits/limiting_sink.h"

namespace host {

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
    next_->log(line);
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
