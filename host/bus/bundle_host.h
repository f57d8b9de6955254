// SPDX-License-Identifier: Apache-2.0
// The bundle, running on a message bus of its own.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include "framework/bundle_runner.h"
#include "host/guard/guard.h"
#include "platform/data_buffer.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"

namespace host {

/// A message bus with the bundle as a client, and the host as another. One per process, since the
/// bundle finds the bus through the process's transport.
class BundleHost {
public:
    /// Starts `bundle`, a shared library. `published` is called with every message that the bundle
    /// publishes, on the publishing thread and by several threads at once; while it runs, the
    /// request that the message answers is not done. Messages of up to `largestMessage` bytes can
    /// be sent. Documents are saved by `guard`, if it has saves. Unless `memoryForRequests` is 0,
    /// the bundle gets requests as admittingRequests() gives them, with a budget of so many bytes,
    /// and those to read that fail for lack of memory are answered. Throws std::runtime_error when
    /// the bundle cannot be loaded or started.
    BundleHost(const std::filesystem::path& bundle, std::size_t largestMessage,
               platform::messaging::MessageHandler published, Guard guard = {},
               std::uint64_t memoryForRequests = 0);

    BundleHost(const BundleHost&) = delete;
    BundleHost& operator=(const BundleHost&) = delete;
    ~BundleHost();

    /// Sends `payload` on `channel`, after waiting until the messages ahead of it leave it room: a
    /// sender that is faster than the bundle is slowed down and loses nothing.
    void publish(const std::string& channel, platform::DataBuffer payload);

    /// Blocks until the bundle is done with all that was sent.
    void waitUntilIdle();

    /// The same, but when that takes longer than `timeout`, calls `giveUp` and ends the process
    /// with the exit status of a failed request: the bundle is still at work, and a graceful
    /// shutdown would wait for it.
    void waitUntilIdle(std::chrono::seconds timeout, const std::function<void()>& giveUp);

private:
    std::shared_ptr<platform::messaging::InProcessBus> bus_;
    std::shared_ptr<platform::messaging::Subscription> observation_;
    std::shared_ptr<platform::messaging::MessageService> client_;
    framework::BundleRunner bundle_;
};

}  // namespace host
