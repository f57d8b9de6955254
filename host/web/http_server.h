// SPDX-License-Identifier: Apache-2.0
// Answers HTTP requests, within limits on what clients can use of the host.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "host/web/listen_address.h"
#include "platform/posix/event.h"
#include "platform/posix/file_descriptor.h"

namespace host {

/// The head of a request. Its texts are valid during the call of the handler.
struct HttpRequest {
    std::string_view method;
    std::string_view path;  ///< Decoded, without the query. Of one that holds a NUL, as it came.
    std::string_view host;  ///< The header "Host"; empty: there is none.
};

struct HttpAnswer {
    unsigned status = 200;
    std::string type;  ///< The media type.
    std::string body;
    platform::FileDescriptor file;  ///< If there is one, it is the body, from its beginning.
    std::vector<std::pair<std::string, std::string>> headers;  ///< Any others.
};

/// An answer of `text` for people and programs.
HttpAnswer plainText(unsigned status, std::string text);

/// What clients can use of the host. A client that exceeds a limit is disconnected.
struct HttpLimits {
    std::chrono::milliseconds head{3'000};     ///< From the connection to the end of the head.
    std::chrono::milliseconds answer{60'000};  ///< From there until the answer has been sent.

    /// The memory of a connection: for the head of the request, and for that of the answer.
    std::size_t memory = std::size_t{16} * 1024;

    /// Connections at a time; more have to wait. Fewer where the process may not open that many
    /// files.
    unsigned connections = 4096;

    /// Of these, for each address; more are refused. 0: no limit. All clients behind one proxy have
    /// the same address, and so have all programs of this machine.
    unsigned connectionsOfAddress = 0;
};

/// An HTTP server with one thread, which waits for all clients at once, so slow clients do not
/// delay others. A connection carries one request; bodies of requests are ignored.
class HttpServer {
public:
    using Handler = std::function<HttpAnswer(const HttpRequest&)>;

    /// Listens at `address`; requests wait until `start`. Throws std::runtime_error when the
    /// address is not available.
    explicit HttpServer(const ListenAddress& address, const HttpLimits& limits = {});

    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    /// Stops answering; requests that are being answered are cut off.
    ~HttpServer();

    /// Where it listens, with the port that it got.
    const ListenAddress& address() const noexcept { return address_; }

    /// Begins to answer with what `handler` returns, on a thread that calls `prepare` first. An
    /// exception of `handler` is logged and answered with status 500. Must be called once. Throws
    /// what `prepare` throws, and std::runtime_error when the server cannot be started.
    void start(std::function<void()> prepare, Handler handler);

private:
    class Loop;

    ListenAddress address_;
    HttpLimits limits_;
    platform::FileDescriptor socket_;
    platform::Event stop_;  // Set when the thread has to end.
    std::thread thread_;
};

}  // namespace host
