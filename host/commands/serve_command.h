// SPDX-License-Identifier: Apache-2.0
// The command `serve`: carries the bundle's messages over NATS.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "host/guard/guard.h"
#include "host/server/nats_server.h"
#include "host/web/web_server.h"

namespace host {

/// Message servers that run elsewhere, and the host's credentials for them.
struct OtherServers {
    std::vector<std::string> urls;  ///< Empty: the host runs a server of its own.
    std::filesystem::path credentialsFile;
    std::filesystem::path tokenFile;
    std::string user;
    std::filesystem::path passwordFile;
    std::filesystem::path caFile;
    std::filesystem::path certificateFile;
    std::filesystem::path keyFile;

    /// The workers of a group share the requests: each goes to one of them.
    std::string group{"serialization"};
};

struct WebOptions {
    bool isServed = true;
    std::filesystem::path folder;  ///< Empty: the one that belongs to the program.
    ListenAddress address{"127.0.0.1", 8080};

    /// Connections that one address may have; 0: as many as there are for all.
    unsigned connectionsOfAddress = 0;
};

struct ServeOptions {
    std::filesystem::path bundle;
    NatsServerOptions ownServer;
    OtherServers otherServers;
    WebOptions web;

    /// The address for programs that monitor the host; nothing: none.
    std::optional<ListenAddress> metrics;

    /// The folders below which clients may have files read and written; empty: everywhere.
    std::vector<std::filesystem::path> roots;

    /// Whether the kernel confines the host to these folders. Otherwise they have no effect.
    bool isConfined = true;
    GuardOptions guard;

    /// The bytes that requests, the values in them and answers may take together.
    std::uint64_t memoryForRequests = 0;

    /// The longest message, in bytes, that is taken or sent in pieces.
    std::size_t largestMessage = std::size_t{1} << 30;
};

/// Serves the bundle's clients until the process gets a signal to end (StopSignals), then finishes
/// the requests that it has taken. Writes to `output`, a line each, how clients connect: "page: ",
/// "metrics: ", "nats: " and "websocket: " with the URL, password included, as far as they are the
/// host's own. Must be called before the process has other threads. Returns the exit status. Throws
/// std::runtime_error when the servers or the bundle cannot be started, when the bundle gets no
/// requests, and when the kernel cannot confine.
///
/// With roots, each thread is confined to what it needs: the one that starts the bundle, and the
/// threads of the bundle with it, to the roots, for good.
int runServe(const ServeOptions& options, int output);

}  // namespace host
