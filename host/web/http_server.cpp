// SPDX-License-Identifier: Apache-2.0
// libmicrohttpd reads and writes the connections, as epoll reports them ready. Its time limit
// counts idle time only, which a client evades by sending a byte now and then. So each connection
// also has a deadline, for its whole head and then for its whole answer, after which its socket is
// shut down. Everything happens on one thread, so nothing needs a lock.
#include "host/web/http_server.h"

#include <microhttpd.h>
#include <netdb.h>
#include <netinet/in.h>
#include <poll.h>
#include <spdlog/spdlog.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <exception>
#include <future>
#include <memory>
#include <new>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <unordered_map>

#include "platform/posix/system_error.h"

namespace host {

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// How often connections are compared with their deadlines.
constexpr milliseconds deadlineInterval{100};

// The addresses of a name, which getaddrinfo has made.
using Addresses = std::unique_ptr<addrinfo, decltype(&::freeaddrinfo)>;

Addresses resolve(const ListenAddress& address) {
    addrinfo hints{};
    hints.ai_flags = AI_PASSIVE;
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    const int error =
        ::getaddrinfo(address.host.c_str(), std::to_string(address.port).c_str(), &hints, &found);
    if (error != 0) {
        throw std::runtime_error(::gai_strerror(error));
    }
    return {found, &::freeaddrinfo};
}

// A socket that listens at the first of the addresses that is available.
platform::FileDescriptor listenAt(const ListenAddress& address) {
    const Addresses addresses = resolve(address);
    for (const addrinfo* each = addresses.get(); each != nullptr; each = each->ai_next) {
        platform::FileDescriptor socket(
            ::socket(each->ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
        // A restarted program can have its port again although the system remembers old
        // connections.
        const int yes = 1;
        if (socket && ::setsockopt(socket.get(), SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes) == 0 &&
            ::bind(socket.get(), each->ai_addr, each->ai_addrlen) == 0 &&
            ::listen(socket.get(), SOMAXCONN) == 0) {
            return socket;
        }
    }
    throw std::system_error(errno, std::generic_category());
}

std::uint16_t portOf(const platform::FileDescriptor& socket) {
    sockaddr_storage address{};
    socklen_t size = sizeof address;
    if (::getsockname(socket.get(), reinterpret_cast<sockaddr*>(&address), &size) != 0) {
        throw std::system_error(errno, std::generic_category());
    }
    return ntohs(address.ss_family == AF_INET6
                     ? reinterpret_cast<const sockaddr_in6&>(address).sin6_port
                     : reinterpret_cast<const sockaddr_in&>(address).sin_port);
}

// The connections that the process can afford: half of the files that it may open. The other half
// is for files that are being sent and for the rest of the program.
unsigned affordableConnections() {
    rlimit files{};
    if (::getrlimit(RLIMIT_NOFILE, &files) != 0) {
        platform::throwSystemError("cannot get the limit of files");
    }
    return static_cast<unsigned>(std::clamp<rlim_t>(files.rlim_cur / 2, 1, 1U << 20U));
}

// The library would cut the path at a NUL and send the file of another name.
std::size_t unescape(void*, MHD_Connection*, char* text) {
    return std::strstr(text, "%00") != nullptr ? std::strlen(text) : ::MHD_http_unescape(text);
}

std::string_view viewOf(const char* text) {
    return text == nullptr ? std::string_view() : text;
}

using Response = std::unique_ptr<MHD_Response, decltype(&::MHD_destroy_response)>;

Response makeResponse(HttpAnswer answer) {
    MHD_Response* made = nullptr;
    struct stat status {};
    if (!answer.file) {
        made = ::MHD_create_response_from_buffer(answer.body.size(), answer.body.data(),
                                                 MHD_RESPMEM_MUST_COPY);
    } else if (::fstat(answer.file.get(), &status) == 0) {
        made = ::MHD_create_response_from_fd64(static_cast<std::uint64_t>(status.st_size),
                                               answer.file.get());
    }
    if (made == nullptr) {
        throw std::runtime_error("an answer cannot be made");
    }
    answer.file.release();  // The response closes it.
    Response response(made, &::MHD_destroy_response);
    answer.headers.emplace_back("Content-Type", std::move(answer.type));
    answer.headers.emplace_back("Connection", "close");
    for (const auto& [name, value] : answer.headers) {
        ::MHD_add_response_header(made, name.c_str(), value.c_str());
    }
    return response;
}

}  // namespace

// The library's server and the connections' deadlines.
class HttpServer::Loop {
public:
    Loop(platform::FileDescriptor socket, const HttpLimits& limits, Handler handler)
        : limits_(limits), handler_(std::move(handler)), daemon_(startDaemon(std::move(socket))) {
        if (!daemon_) {
            throw std::runtime_error("the web server cannot be started");
        }
        epoll_ = ::MHD_get_daemon_info(daemon_.get(), MHD_DAEMON_INFO_EPOLL_FD)->epoll_fd;
    }

    // Serves until `stop` is readable.
    void run(int stop) {
        std::array<pollfd, 2> waited{{{epoll_, POLLIN, 0}, {stop, POLLIN, 0}}};
        while (waited[1].revents == 0) {
            ::poll(waited.data(), waited.size(), timeout());
            wasIdle_ = deadlines_.empty();
            ::MHD_run(daemon_.get());
            disconnectOverdue();
        }
    }

private:
    using Daemon = std::unique_ptr<MHD_Daemon, decltype(&::MHD_stop_daemon)>;

    Daemon startDaemon(platform::FileDescriptor socket) {
        return {::MHD_start_daemon(MHD_USE_EPOLL, 0, nullptr, nullptr, &Loop::answer, this,
                                   // The library closes it even on failure.
                                   MHD_OPTION_LISTEN_SOCKET, socket.release(),
                                   MHD_OPTION_CONNECTION_LIMIT,
                                   std::min(limits_.connections, affordableConnections()),
                                   MHD_OPTION_PER_IP_CONNECTION_LIMIT, limits_.connectionsOfAddress,
                                   MHD_OPTION_CONNECTION_MEMORY_LIMIT, limits_.memory,
                                   MHD_OPTION_STRICT_FOR_CLIENT, 1, MHD_OPTION_UNESCAPE_CALLBACK,
                                   &unescape, nullptr, MHD_OPTION_NOTIFY_CONNECTION,
                                   &Loop::connectionChanged, this, MHD_OPTION_END),
                &::MHD_stop_daemon};
    }

    static int socketOf(MHD_Connection* connection) {
        return ::MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CONNECTION_FD)->connect_fd;
    }

    // No exception may leave this function and the next: the library is written in C.

    static void connectionChanged(void* self, MHD_Connection* connection, void**,
                                  MHD_ConnectionNotificationCode change) {
        Loop& loop = *static_cast<Loop*>(self);
        const int socket = socketOf(connection);
        if (change != MHD_CONNECTION_NOTIFY_STARTED) {
            loop.deadlines_.erase(socket);
            return;
        }
        try {
            loop.deadlines_[socket] = Clock::now() + loop.limits_.head;
        } catch (const std::bad_alloc&) {
            ::shutdown(socket, SHUT_RDWR);
        }
    }

    static MHD_Result answer(void* self, MHD_Connection* connection, const char* path,
                             const char* method, const char*, const char*, std::size_t*, void**) {
        Loop& loop = *static_cast<Loop*>(self);
        try {
            loop.deadlines_[socketOf(connection)] = Clock::now() + loop.limits_.answer;
            const char* const host =
                ::MHD_lookup_connection_value(connection, MHD_HEADER_KIND, "Host");
            HttpAnswer answer = loop.answerTo({method, path, viewOf(host)});
            const unsigned status = answer.status;
            const Response response = makeResponse(std::move(answer));
            return ::MHD_queue_response(connection, status, response.get());
        } catch (const std::exception& error) {
            spdlog::error("a request over HTTP failed: {}", error.what());
            return MHD_NO;
        }
    }

    HttpAnswer answerTo(const HttpRequest& request) const {
        try {
            return handler_(request);
        } catch (const std::exception& error) {
            spdlog::error("a request over HTTP failed: {}", error.what());
            return plainText(500, "This failed.\n");
        }
    }

    // In milliseconds, as poll takes it. When the last connection ends, the library has to run once
    // more before it learns of new ones.
    int timeout() const {
        MHD_UNSIGNED_LONG_LONG wanted = 0;
        if (::MHD_get_timeout(daemon_.get(), &wanted) == MHD_YES && wanted == 0) {
            return 0;
        }
        return wasIdle_ && deadlines_.empty() ? -1 : static_cast<int>(deadlineInterval.count());
    }

    void disconnectOverdue() {
        const Clock::time_point now = Clock::now();
        if (now < nextLook_) {
            return;
        }
        nextLook_ = now + deadlineInterval;
        for (const auto& [socket, deadline] : deadlines_) {
            if (deadline < now) {
                ::shutdown(socket, SHUT_RDWR);  // The library notices that it has ended.
            }
        }
    }

    const HttpLimits limits_;
    const Handler handler_;
    std::unordered_map<int, Clock::time_point> deadlines_;  // by the connection's socket
    Clock::time_point nextLook_;
    bool wasIdle_ = false;
    Daemon daemon_;  // Destroyed first, since it reports the ends of connections.
    int epoll_ = -1;
};

HttpAnswer plainText(unsigned status, std::string text) {
    HttpAnswer answer;
    answer.status = status;
    answer.type = "text/plain; charset=utf-8";
    answer.body = std::move(text);
    return answer;
}

HttpServer::HttpServer(const ListenAddress& address, const HttpLimits& limits)
    : address_(address), limits_(limits) {
    try {
        socket_ = listenAt(address);
        address_.port = portOf(socket_);
    } catch (const std::exception& error) {
        throw std::runtime_error("cannot listen at " + address.authority() + ": " + error.what());
    }
}

HttpServer::~HttpServer() {
    stop_.set();
    if (thread_.joinable()) {
        thread_.join();
    }
}

void HttpServer::start(std::function<void()> prepare, Handler handler) {
    std::promise<void> running;
    std::future<void> whenRunning = running.get_future();
    // The thread owns the promise, since it may still be using it when the future is ready.
    thread_ = std::thread([this, running = std::move(running), prepare = std::move(prepare),
                           handler = std::move(handler)]() mutable {
        std::optional<Loop> loop;
        try {
            prepare();
            loop.emplace(std::move(socket_), limits_, std::move(handler));
        } catch (...) {
            return running.set_exception(std::current_exception());
        }
        running.set_value();
        loop->run(stop_.descriptor());
    });
    whenRunning.get();
}

}  // namespace host
