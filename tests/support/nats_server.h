// SPDX-License-Identifier: Apache-2.0
// A real nats-server for a test, on free ports of the loopback interface, with a folder of its own.
#pragma once

#include <optional>
#include <string>

#include "tests/support/child_process.h"
#include "tests/support/temporary_directory.h"

namespace test {

/// A nats-server process. Killed with this object, and with the thread that started it.
class NatsServer {
public:
    /// Starts a server and waits until it takes connections. `configuration`: what else stands in
    /// its configuration file, besides the address and the port. Throws std::runtime_error with the
    /// server's log when it does not start.
    explicit NatsServer(const std::string& configuration = "");

    NatsServer(const NatsServer&) = delete;
    NatsServer& operator=(const NatsServer&) = delete;
    ~NatsServer() = default;

    /// Ends it with SIGKILL.
    void kill();

    /// Starts it again, on the same port.
    void start();

    /// As `start`, with another configuration.
    void startWith(const std::string& configuration);

    int port() const { return port_; }
    std::string url() const { return "nats://127.0.0.1:" + std::to_string(port_); }

    /// What it has logged.
    std::string log() const;

private:
    void waitUntilReady();

    TemporaryDirectory folder_;
    std::string configuration_;
    int port_;
    std::optional<ChildProcess> process_;
};

/// A port of the loopback interface that nothing listens on.
int freePort();

}  // namespace test
