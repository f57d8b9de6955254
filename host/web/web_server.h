// SPDX-License-Identifier: Apache-2.0
// Serves a folder over HTTP, so that a browser has a page from which to reach the bundle.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <future>
#include <memory>
#include <string>
#include <thread>

namespace host {

/// Where a server listens.
struct ListenAddress {
    std::string host;        ///< A name, or an IP address, one of version 6 without brackets.
    std::uint16_t port = 0;  ///< 0: any free one.

    /// Reads "127.0.0.1:8080", "localhost:8080" or "[::1]:8080". Throws std::invalid_argument.
    static ListenAddress parse(const std::string& text);

    /// The host and the port, as they stand in a URL.
    std::string authority() const;

    /// "http://127.0.0.1:8080": the origin of pages that are served there.
    std::string origin() const { return "http://" + authority(); }
};

/// A web server for files, which answers GET and HEAD and knows nothing of the bundle. What a
/// client can use of the host is bounded: a few threads, a few connections, each for one short
/// request that is answered in limited time.
class WebServer {
public:
    /// Listens at `address` for requests of the files in `folder`, which are not answered yet.
    /// Throws std::runtime_error when there is no such folder, or the address is taken.
    WebServer(const std::filesystem::path& folder, const ListenAddress& address);

    WebServer(const WebServer&) = delete;
    WebServer& operator=(const WebServer&) = delete;

    /// Stops answering; requests that are being answered are cut off.
    ~WebServer();

    /// "http://127.0.0.1:8080": the origin of the pages. When it is on the loopback address,
    /// requests that were meant for another are refused, so that no page of another site can have
    /// its name point at this machine and read what is served.
    const std::string& origin() const noexcept { return origin_; }

    /// Begins to answer, on threads of its own, the first of which does `prepare` before it starts
    /// the others. To be called once. Throws what `prepare` throws.
    void start(std::function<void()> prepare);

private:
    class Server;

    std::unique_ptr<Server> server_;
    std::string origin_;
    std::thread thread_;
};

}  // namespace host
