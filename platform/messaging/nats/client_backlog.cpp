// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/client_backlog.h"

#include <simdjson.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <stdexcept>
#include <thread>

#include "platform/messaging/nats/connection.h"
#include "platform/messaging/nats/handles.h"

namespace platform::messaging {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds pollInterval{10};

// Servers report each account's own connections; this asks for the one with the most pending bytes.
constexpr const char* subject = "$SYS.REQ.ACCOUNT.PING.CONNZ";
constexpr const char* question = R"({"sort":"pending","limit":1})";

// The pending bytes of the client that has the most, if the server answers within `timeout`.
std::optional<std::uint64_t> largestBacklog(const nats::Connection& connection,
                                            milliseconds timeout) {
    natsMsg* received = nullptr;
    const natsStatus status = natsConnection_RequestString(&received, connection.get(), subject,
                                                           question, timeout.count());
    if (status == NATS_TIMEOUT) {
        return std::nullopt;
    }
    nats::check(status, "The NATS server does not report on its clients");
    const std::unique_ptr<natsMsg, nats::Destroy> reply(received);
    simdjson::dom::parser parser;
    std::uint64_t bytes = 0;
    const simdjson::error_code error =
        parser
            .parse(natsMsg_GetData(reply.get()),
                   static_cast<std::size_t>(natsMsg_GetDataLength(reply.get())))
            .at_pointer("/data/connections/0/pending_bytes")
            .get(bytes);
    if (error != simdjson::SUCCESS) {
        throw std::runtime_error("The NATS server does not report what waits for its clients.");
    }
    return bytes;
}

}  // namespace

bool waitForClientBacklog(const NatsOptions& options, milliseconds timeout) {
    const Clock::time_point deadline = Clock::now() + timeout;
    const nats::ConnectionHandle connection =
        nats::openConnection(options, "client_backlog", /*listener=*/0);
    for (;;) {
        const auto left = std::chrono::duration_cast<milliseconds>(deadline - Clock::now());
        if (left <= milliseconds::zero()) {
            return false;
        }
        if (largestBacklog(*connection, left) == 0) {
            return true;
        }
        std::this_thread::sleep_for(pollInterval);
    }
}

}  // namespace platform::messaging
