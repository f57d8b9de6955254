// SPDX-License-Identifier: Apache-2.0
#include "host/metrics/request_metrics.h"

#include <spdlog/fmt/fmt.h>

#include <algorithm>

namespace host {

namespace {

constexpr std::array<std::string_view, 2> kindNames{"read", "write"};
constexpr std::array<std::string_view, 3> outcomeNames{"success", "failure", "no_answer"};

template <typename Enumerator>
constexpr std::size_t indexOf(Enumerator value) {
    return static_cast<std::size_t>(value);
}

}  // namespace

void RequestMetrics::begin(RequestKind kind, std::size_t requestBytes) noexcept {
    OfKind& counts = kinds_[indexOf(kind)];
    ++counts.begun;
    counts.requestBytes += requestBytes;
}

void RequestMetrics::end(RequestKind kind, RequestOutcome outcome, std::size_t answerBytes,
                         std::chrono::nanoseconds duration) noexcept {
    OfKind& counts = kinds_[indexOf(kind)];
    const double seconds = std::chrono::duration<double>(duration).count();
    const auto bucket = std::lower_bound(bounds.begin(), bounds.end(), seconds) - bounds.begin();
    ++counts.durations[static_cast<std::size_t>(bucket)];
    counts.nanoseconds += static_cast<std::uint64_t>(duration.count());
    counts.answerBytes += answerBytes;
    ++counts.outcomes[indexOf(outcome)];
    ++counts.ended;
}

void RequestMetrics::wait(RequestKind kind) noexcept {
    ++kinds_[indexOf(kind)].waiting;
}

void RequestMetrics::endWait(RequestKind kind) noexcept {
    --kinds_[indexOf(kind)].waiting;
}

void RequestMetrics::refuse(RequestKind kind) noexcept {
    ++kinds_[indexOf(kind)].refused;
}

std::string RequestMetrics::text() const {
    std::string text;
    const auto add = [&](std::string_view name, std::string_view type, std::string_view help,
                         const auto& linesOf) {
        text += metricHeader(name, type, help);
        for (std::size_t kind = 0; kind < kinds_.size(); ++kind) {
            text += linesOf(kinds_[kind], kindNames[kind]);
        }
    };
    add("editor_requests_total", "counter", "Requests that the bundle has handled.",
        [](const OfKind& counts, std::string_view kind) {
            std::string lines;
            for (std::size_t outcome = 0; outcome < outcomeNames.size(); ++outcome) {
                lines += fmt::format("editor_requests_total{{kind=\"{}\",outcome=\"{}\"}} {}\n",
                                     kind, outcomeNames[outcome], counts.outcomes[outcome].load());
            }
            return lines;
        });
    add("editor_requests_under_way", "gauge", "Requests that the bundle is handling.",
        [](const OfKind& counts, std::string_view kind) {
            // In this order, so that requests that begin in between do not make it negative.
            const std::uint64_t ended = counts.ended;
            return fmt::format("editor_requests_under_way{{kind=\"{}\"}} {}\n", kind,
                               counts.begun.load() - ended);
        });
    add("editor_requests_waiting", "gauge", "Large requests that wait for memory.",
        [](const OfKind& counts, std::string_view kind) {
            return fmt::format("editor_requests_waiting{{kind=\"{}\"}} {}\n", kind,
                               counts.waiting.load());
        });
    add("editor_requests_refused_total", "counter",
        "Requests that were refused for the memory that they would take.",
        [](const OfKind& counts, std::string_view kind) {
            return fmt::format("editor_requests_refused_total{{kind=\"{}\"}} {}\n", kind,
                               counts.refused.load());
        });
    add("editor_request_bytes_total", "counter", "The size of the requests.",
        [](const OfKind& counts, std::string_view kind) {
            return fmt::format("editor_request_bytes_total{{kind=\"{}\"}} {}\n", kind,
                               counts.requestBytes.load());
        });
    add("editor_answer_bytes_total", "counter", "The size of the answers.",
        [](const OfKind& counts, std::string_view kind) {
            return fmt::format("editor_answer_bytes_total{{kind=\"{}\"}} {}\n", kind,
                               counts.answerBytes.load());
        });
    add("editor_request_seconds", "histogram", "The time that the bundle takes for a request.",
        [](const OfKind& counts, std::string_view kind) {
            std::string lines;
            std::uint64_t count = 0;
            for (std::size_t bucket = 0; bucket <= bounds.size(); ++bucket) {
                count += counts.durations[bucket];
                lines += fmt::format(
                    "editor_request_seconds_bucket{{kind=\"{}\",le=\"{}\"}} {}\n", kind,
                    bucket < bounds.size() ? fmt::format("{}", bounds[bucket]) : "+Inf", count);
            }
            return lines + fmt::format(
                               "editor_request_seconds_sum{{kind=\"{0}\"}} {1}\n"
                               "editor_request_seconds_count{{kind=\"{0}\"}} {2}\n",
                               kind, static_cast<double>(counts.nanoseconds) / 1e9, count);
        });
    return text;
}

std::string metricHeader(std::string_view name, std::string_view type, std::string_view help) {
    return fmt::format("# HELP {} {}\n# TYPE {} {}\n", name, help, name, type);
}

}  // namespace host
