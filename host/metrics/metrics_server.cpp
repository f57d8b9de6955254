// SPDX-License-Identifier: Apache-2.0
#include "host/metrics/metrics_server.h"

#include <fcntl.h>
#include <spdlog/fmt/fmt.h>
#include <sys/resource.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <cstdint>
#include <string_view>
#include <utility>

namespace host {

namespace {

std::string gauge(std::string_view name, std::string_view help, std::uint64_t value) {
    return metricHeader(name, "gauge", help) + fmt::format("{} {}\n", name, value);
}

}  // namespace

MetricsServer::MetricsServer(const ListenAddress& address, MetricsSources sources)
    : sources_(std::move(sources)),
      memory_(::open("/proc/self/statm", O_RDONLY | O_CLOEXEC)),
      server_(address) {}

void MetricsServer::start(std::function<void()> prepare) {
    server_.start(std::move(prepare), [this](const HttpRequest& request) {
        HttpAnswer result = answer(request);
        result.headers.emplace_back("X-Content-Type-Options", "nosniff");
        result.headers.emplace_back("Cross-Origin-Resource-Policy", "same-origin");
        result.headers.emplace_back("Cache-Control", "no-store");
        return result;
    });
}

HttpAnswer MetricsServer::answer(const HttpRequest& request) const {
    if (request.method != "GET" && request.method != "HEAD") {
        return plainText(405, "Only GET and HEAD are supported.\n");
    }
    if (request.path == "/healthz") {
        return health();
    }
    if (request.path == "/metrics") {
        HttpAnswer result = plainText(200, metrics());
        result.type = "text/plain; version=0.0.4; charset=utf-8";
        return result;
    }
    return plainText(404, "There are /metrics and /healthz.\n");
}

HttpAnswer MetricsServer::health() const {
    if (!sources_.isConnected()) {
        return plainText(503, "no connection to the message servers\n");
    }
    if (!sources_.areRootsReadable()) {
        return plainText(503, "a folder of --root cannot be read\n");
    }
    return plainText(200, "ok\n");
}

std::string MetricsServer::metrics() const {
    const BusBacklog backlog = sources_.backlog();
    const RequestMemory memory = sources_.requestMemory();
    return metricHeader("editor_build_info", "gauge", "The version of the program.") +
           fmt::format("editor_build_info{{version=\"{}\"}} 1\n", sources_.version) +
           gauge("editor_bus_connected", "Whether the message servers are connected.",
                 sources_.isConnected() ? 1 : 0) +
           metricHeader("editor_bus_reconnects_total", "counter",
                        "How many times the message servers had to be connected again.") +
           fmt::format("editor_bus_reconnects_total {}\n", sources_.reconnects()) +
           gauge("editor_bus_waiting_messages", "Messages that wait to be handled.",
                 backlog.messages) +
           gauge("editor_bus_waiting_bytes", "The size of these.", backlog.bytes) +
           metricHeader("editor_bus_dropped_messages_total", "counter",
                        "Messages that were dropped because too many waited.") +
           fmt::format("editor_bus_dropped_messages_total {}\n", backlog.dropped) +
           gauge("editor_request_memory_bytes", "Memory that requests have reserved.",
                 memory.reserved) +
           gauge("editor_request_memory_limit_bytes", "What they may reserve together.",
                 memory.size) +
           gauge("editor_roots_readable", "Whether the folders of --root can be read.",
                 sources_.areRootsReadable() ? 1 : 0) +
           memoryMetrics() + sources_.requests->text();
}

std::string MetricsServer::memoryMetrics() const {
    // Pages: those of the address space, and those of them that are in memory.
    std::array<char, 256> text{};
    const ssize_t size = ::pread(memory_.get(), text.data(), text.size(), 0);
    const std::string_view line(text.data(), size > 0 ? static_cast<std::size_t>(size) : 0);
    std::uint64_t pages = 0;
    if (const std::size_t blank = line.find(' '); blank != std::string_view::npos) {
        std::from_chars(line.data() + blank + 1, line.data() + line.size(), pages);
    }
    rlimit limit{RLIM_INFINITY, RLIM_INFINITY};
    ::getrlimit(RLIMIT_DATA, &limit);
    std::string result = gauge("process_resident_memory_bytes", "The memory of the process.",
                               pages * static_cast<std::uint64_t>(::sysconf(_SC_PAGESIZE)));
    if (limit.rlim_cur != RLIM_INFINITY) {
        result += gauge("editor_memory_limit_bytes",
                        "The memory for data, beyond which requests fail.", limit.rlim_cur);
    }
    return result;
}

}  // namespace host
