// SPDX-License-Identifier: Apache-2.0
// The address where a server listens: how people write it and browsers name it.
#pragma once

#include <cstdint>
#include <string>

namespace host {

/// Where a server listens.
struct ListenAddress {
    std::string host;        ///< A name, or an IP address, one of version 6 without brackets.
    std::uint16_t port = 0;  ///< 0: any free one.

    /// Reads "127.0.0.1:8080", "localhost:8080" or "[::1]:8080". Throws std::invalid_argument.
    static ListenAddress parse(const std::string& text);

    /// Whether only programs of this machine can connect to it.
    bool isLoopback() const;

    /// The host and the port, as they stand in a URL.
    std::string authority() const;

    /// "http://127.0.0.1:8080": the origin of pages that are served there.
    std::string origin() const { return "http://" + authority(); }
};

}  // namespace host
