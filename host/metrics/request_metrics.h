// SPDX-License-Identifier: Apache-2.0
// Counts of the bundle's requests and answers, for those who watch a server.
#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace host {

enum class RequestKind { read, write };
enum class RequestOutcome { success, failure, noAnswer };

/// What has been counted since the program was started. May be used by several threads at once.
class RequestMetrics {
public:
    /// Upper bounds of the histogram's buckets, in seconds; a further one has no bound.
    static constexpr std::array<double, 9> bounds{0.001, 0.003, 0.01, 0.03, 0.1, 0.3, 1, 3, 10};

    void begin(RequestKind kind, std::size_t requestBytes) noexcept;
    void end(RequestKind kind, RequestOutcome outcome, std::size_t answerBytes,
             std::chrono::nanoseconds duration) noexcept;

    /// A request begins, or ends, to wait for the memory that it takes.
    void wait(RequestKind kind) noexcept;
    void endWait(RequestKind kind) noexcept;

    /// A request is refused for the memory that it would take.
    void refuse(RequestKind kind) noexcept;

    /// In Prometheus' text format.
    std::string text() const;

private:
    using Counter = std::atomic<std::uint64_t>;

    struct OfKind {
        std::array<Counter, 3> outcomes{};
        std::array<Counter, bounds.size() + 1> durations{};
        Counter nanoseconds{0};
        Counter requestBytes{0};
        Counter answerBytes{0};
        Counter begun{0};
        Counter ended{0};
        Counter waiting{0};
        Counter refused{0};
    };

    std::array<OfKind, 2> kinds_;
};

/// The lines that introduce a metric in Prometheus' text format.
std::string metricHeader(std::string_view name, std::string_view type, std::string_view help);

}  // namespace host
