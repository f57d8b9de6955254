// SPDX-License-Identifier: Apache-2.0
// The nats-server that the host runs for itself, so that browsers and other programs of this
// machine can be the bundle's clients without any set-up.
//
// One thread supervises it: it starts the server, reads its output, and starts it again when it
// ends, with the same ports and passwords. The thread needs files that the rest of the host may not
// open, so a NatsServer must be made before any confinement.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <future>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "host/server/nats_configuration.h"
#include "host/server/nats_process.h"
#include "host/server/private_folder.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/posix/event.h"

namespace host {

struct NatsServerOptions {
    std::filesystem::path program;  ///< Empty: nats-server, from the usual folders.
    std::uint16_t port = 0;         ///< On the loopback address; 0: any free one.
    std::uint16_t webSocketPort = 0;
    std::vector<std::string> allowedOrigins;  ///< As in NatsConfiguration.
};

/// A supervised nats-server. It is stopped with this object, once its clients have read what it
/// holds for them or some seconds have passed, and ends with the host however that ends.
class NatsServer {
public:
    /// Starts the server, with its files in `folder`, and waits until it takes connections. Throws
    /// std::runtime_error when there is no such program, naming the package that has it, and when
    /// it does not start, with its output. The folder is removed when the server has ended.
    NatsServer(NatsServerOptions options, const PrivateFolder& folder);

    NatsServer(const NatsServer&) = delete;
    NatsServer& operator=(const NatsServer&) = delete;
    ~NatsServer();

    /// "127.0.0.1:4222": where clients connect.
    std::string address() const { return "127.0.0.1:" + std::to_string(configuration_.port); }

    /// The same for clients that speak WebSocket.
    std::string webSocketAddress() const {
        return "127.0.0.1:" + std::to_string(configuration_.webSocketPort);
    }

    const NatsUsers& users() const noexcept { return configuration_.users; }

    /// How the host itself connects.
    platform::messaging::NatsOptions workerConnection() const;

private:
    void supervise(std::promise<void> ready);
    std::optional<std::string> runOnce(const std::function<void()>& whenReady);
    void keepPorts(const NatsPorts& ports);
    void waitForClients() const;

    std::filesystem::path program_;
    const PrivateFolder& folder_;
    NatsConfiguration configuration_;  // The ports change until the server is first ready.
    platform::Event stop_;             // Set when the server has to stop.
    std::thread supervisor_;
};

}  // namespace host
