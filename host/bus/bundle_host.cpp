// SPDX-License-Identifier: Apache-2.0
#include "host/bus/bundle_host.h"

#include <spdlog/spdlog.h>

#include <algorithm>
#include <cstdlib>
#include <exception>
#include <future>
#include <string_view>
#include <utility>

#include "host/bus/failed_reads.h"
#include "host/bus/request_admission.h"
#include "host/exit_status.h"
#include "host/guard/guarded_client.h"
#include "host/limits/memory_limit.h"
#include "platform/messaging/resolved.h"
#include "platform/messaging/transport.h"

namespace host {

namespace {

using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;

// The name under which the host is a client of the bus.
constexpr const char* clientName = "serialization_host";

// The bytes that may wait for the bundle while the next message is taken in: enough to keep it
// busy. A larger message waits until nothing else does.
constexpr std::size_t usualQueuedBytes = std::size_t{16} * 1024 * 1024;
constexpr std::size_t mostQueuedMessages = 4096;

// Makes the bundle's client.
platform::messaging::Transport transportOf(const std::shared_ptr<InProcessBus>& bus, Guard guard,
                                           std::uint64_t memoryForRequests) {
    using namespace platform::messaging;
    const RequestBudgets budgets(memoryForRequests, memoryForDocuments(memoryForRequests));
    return [=](const std::string& name, const MessageServiceOptions&) {
        std::shared_ptr<MessageService> client = bus->connect(name).get();
        if (memoryForRequests != 0) {
            client = answeringFailedReads(admittingRequests(std::move(client), budgets));
        }
        if (guard.saves) {
            client = savingSafely(std::move(client), guard);
        }
        return resolved([&client] { return client; });
    };
}

// A bus on which createMessageService makes its clients from now on.
std::shared_ptr<InProcessBus> makeBus(std::size_t largestMessage, Guard guard,
                                      std::uint64_t memoryForRequests) {
    platform::messaging::InProcessBusOptions options;
    options.maxQueuedBytes = std::max(largestMessage, usualQueuedBytes);
    // A large document must not hold up the small ones behind it.
    options.concurrentChannels = {platform::messaging::readRequestChannel};
    std::shared_ptr<InProcessBus> bus = InProcessBus::create(std::move(options));
    platform::messaging::setTransport(transportOf(bus, std::move(guard), memoryForRequests));
    return bus;
}

}  // namespace

BundleHost::BundleHost(const std::filesystem::path& bundle, std::size_t largestMessage,
                       platform::messaging::MessageHandler published, Guard guard,
                       std::uint64_t memoryForRequests)
    : bus_(makeBus(largestMessage, std::move(guard), memoryForRequests)),
      observation_(bus_->observe(
          [published = std::move(published)](std::string_view sender, const JsonMessage& message) {
              if (sender != clientName) {
                  published(message);
              }
          })),
      client_(bus_->connect(clientName).get()),
      bundle_(bundle) {}

// The transport keeps the bus and the guard of its saves alive.
BundleHost::~BundleHost() {
    platform::messaging::setTransport({});
}

void BundleHost::publish(const std::string& channel, platform::DataBuffer payload) {
    const std::size_t size = payload.length();
    bus_->waitUntilQueuedAtMost(mostQueuedMessages - 1,
                                usualQueuedBytes - std::min(size, usualQueuedBytes));
    client_->publish(channel, std::move(payload)).get();
}

void BundleHost::waitUntilIdle() {
    bus_->waitUntilIdle();
}

void BundleHost::waitUntilIdle(std::chrono::seconds timeout, const std::function<void()>& giveUp) {
    const std::future<void> idle =
        std::async(std::launch::async, [this] { bus_->waitUntilIdle(); });
    if (idle.wait_for(timeout) == std::future_status::timeout) {
        try {
            giveUp();
        } catch (const std::exception& error) {
            spdlog::error("{}", error.what());
        }
        std::_Exit(exitRequestFailed);
    }
}

}  // namespace host
