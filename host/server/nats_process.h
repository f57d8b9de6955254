// SPDX-License-Identifier: Apache-2.0
// One run of the nats-server program, from its start to its end.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <future>
#include <optional>
#include <string>

#include "host/server/child_process.h"

namespace host {

/// The program `program`, or the nats-server of this machine if that is empty. Throws
/// std::runtime_error when there is none, naming the package that has it.
std::filesystem::path findNatsServer(const std::filesystem::path& program);

/// The ports of a running server, on the loopback address.
struct NatsPorts {
    std::uint16_t client = 0;
    std::uint16_t webSocket = 0;
};

/// A running nats-server, which is killed at the end of this object's life.
class NatsProcess {
public:
    enum class State { runs, hasEnded, isToStop };

    static constexpr std::chrono::milliseconds forever{-1};

    /// Starts `program` with the configuration file `configuration`, which names the file's own
    /// folder as the one for the file of its ports. `stop` is a descriptor that becomes readable
    /// when the server is to be stopped. Throws std::system_error.
    NatsProcess(const std::filesystem::path& program, const std::filesystem::path& configuration,
                int stop);

    /// The ports on which the server takes connections; nothing until it does.
    std::optional<NatsPorts> ports() const;

    /// Logs the server's output until the state is no longer `runs`, or for `timeout`.
    State follow(std::chrono::milliseconds timeout);

    /// Logs the server's output until `end` is ready: a server whose output nobody reads blocks.
    void followUntil(const std::future<void>& end);

    /// Stops the server, by force if it does not exit in time.
    void end();

    /// Waits for the server's end and returns its reason, with the last error that the server
    /// logged.
    std::string collect();

private:
    State followOnce(std::chrono::milliseconds timeout);
    bool logOutput();
    void log(const std::string& line);

    std::filesystem::path folder_;
    int stop_;
    ChildProcess process_;
    std::string said_;  // The beginning of a line.
    std::string complaint_;
};

}  // namespace host
