// SPDX-License-Identifier: Apache-2.0
// The host's state for monitoring programs: /metrics for Prometheus, /healthz for load balancers.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "host/metrics/request_metrics.h"
#include "host/web/http_server.h"
#include "host/web/listen_address.h"
#include "platform/posix/file_descriptor.h"

namespace host {

/// What a bus has taken from its servers and not handed out yet.
struct BusBacklog {
    std::uint64_t messages = 0;
    std::uint64_t bytes = 0;
    std::uint64_t dropped = 0;  ///< Messages for which there was no room, since it was connected.
};

/// The memory that requests may take together, in bytes.
struct RequestMemory {
    std::uint64_t reserved = 0;
    std::uint64_t size = 0;
};

struct MetricsSources {
    std::string version;  ///< That of the program.
    std::shared_ptr<const RequestMetrics> requests;
    std::function<bool()> isConnected;          ///< To the message servers.
    std::function<std::uint64_t()> reconnects;  ///< How many times they had to be connected again.
    std::function<BusBacklog()> backlog;
    std::function<RequestMemory()> requestMemory;
    std::function<bool()> areRootsReadable;
};

class MetricsServer {
public:
    /// Listens at `address`. Throws std::runtime_error.
    MetricsServer(const ListenAddress& address, MetricsSources sources);

    const ListenAddress& address() const noexcept { return server_.address(); }

    /// Begins to answer, on a thread that calls `prepare` first. Must be called once. Throws what
    /// `prepare` throws.
    void start(std::function<void()> prepare);

private:
    HttpAnswer answer(const HttpRequest& request) const;
    HttpAnswer health() const;
    std::string metrics() const;
    std::string memoryMetrics() const;

    const MetricsSources sources_;
    const platform::FileDescriptor memory_;  // Open, since the thread may open no files.
    HttpServer server_;                      // Ends first: its thread uses the others.
};

}  // namespace host
