// SPDX-License-Identifier: Apache-2.0
// The configuration of the nats-server that the host runs for itself.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

namespace host {

/// A user of a message server.
struct Login {
    std::string user;
    std::string password;
};

/// The two users of the host's own server. The worker may do everything, and is the host. An editor
/// is anyone who has the password: it may publish requests, and subscribe to the notifications and
/// to the answers for clients whose "rtcId" begins with the editor's name and a dot.
struct NatsUsers {
    Login worker;
    Login editor;
};

struct NatsConfiguration {
    std::filesystem::path runtimeFolder;  ///< Where the server writes which ports it has.
    std::uint16_t port = 0;           ///< For clients, on the loopback address; 0: any free one.
    std::uint16_t webSocketPort = 0;  ///< The same, for clients in a browser.
    NatsUsers users;
    /// The origins, as "http://localhost:3000", of the web pages that may connect. No two of them
    /// may have the same host (see commonHost). Programs other than browsers name no origin and may
    /// always connect.
    std::vector<std::string> allowedOrigins;
};

/// The text of the configuration file.
std::string configurationText(const NatsConfiguration& configuration);

/// A password that cannot be guessed: 256 random bits as hexadecimal digits.
std::string makePassword();

/// Whether `text` is a scheme, http or https, a host in lower case, and perhaps a port: what a
/// browser sends as the origin of a page.
bool isOrigin(const std::string& text);

/// A host that two of `origins` have in common, with different schemes or ports; empty when there
/// is none. The server takes the last origin of each host and forgets the others.
std::string commonHost(const std::vector<std::string>& origins);

}  // namespace host
