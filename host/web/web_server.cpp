// SPDX-License-Identifier: Apache-2.0
#include "host/web/web_server.h"

#include <httplib.h>
#include <poll.h>
#include <spdlog/spdlog.h>
#include <sys/eventfd.h>
#include <sys/socket.h>

#include <strings.h>
#include <array>
#include <cerrno>
#include <charconv>
#include <chrono>
#include <cstddef>
#include <cstring>
#include <exception>
#include <optional>
#include <semaphore>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "host/web/web_folder.h"
#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

using Clock = std::chrono::steady_clock;

// What one client can use.
constexpr std::size_t largestHead = std::size_t{16} * 1024;  // of a request: its line and headers
constexpr std::chrono::seconds longestHead{3};
constexpr std::chrono::seconds longestAnswer{60};

// What all of them can.
constexpr std::size_t threads = 16;
constexpr std::ptrdiff_t mostConnections = 64;

// Pages run their own scripts and no others, stand in no frame of another site's, and connect to
// message servers.
constexpr const char* contentPolicy =
    "default-src 'self'; img-src 'self' data: blob:; font-src 'self' data:; "
    "style-src 'self' 'unsafe-inline'; worker-src 'self' blob:; connect-src 'self' ws: wss:; "
    "object-src 'none'; base-uri 'none'; form-action 'none'; frame-ancestors 'none'";

// Waits until `fd` is ready for `events`; false when the time is over or `stop` readable before.
bool waitFor(int fd, short events, int stop, Clock::time_point latest) {
    for (;;) {
        const auto left =
            std::chrono::ceil<std::chrono::milliseconds>(latest - Clock::now()).count();
        std::array<pollfd, 2> waited{{{fd, events, 0}, {stop, POLLIN, 0}}};
        const int count =
            left <= 0 ? 0 : ::poll(waited.data(), waited.size(), static_cast<int>(left));
        if (count > 0) {
            return waited[1].revents == 0;
        }
        if (count == 0 || errno != EINTR) {
            return false;
        }
    }
}

// The lines of a request's head with their ends, the empty line included; nothing when it does not
// come, whole and in time. What comes behind it is of no interest.
std::optional<std::string> readHead(int socket, int stop) {
    const Clock::time_point latest = Clock::now() + longestHead;
    std::string head;
    while (head.size() < largestHead && waitFor(socket, POLLIN, stop, latest)) {
        std::array<char, 4096> chunk{};
        const ssize_t count = ::recv(socket, chunk.data(), chunk.size(), MSG_DONTWAIT);
        if (count <= 0) {
            return std::nullopt;
        }
        head.append(chunk.data(), static_cast<std::size_t>(count));
        if (const std::size_t end = head.find("\r\n\r\n"); end != std::string::npos) {
            head.resize(end + 4);
            return head;
        }
    }
    return std::nullopt;
}

// `head` without the headers that ask for parts of a file, which a server is free to send whole:
// asking for many parts would make a small file a large answer.
std::string withoutRanges(const std::string& head) {
    constexpr std::string_view name = "Range:";
    std::string result;
    for (std::size_t begin = 0; begin < head.size();) {
        const std::size_t end = head.find('\n', begin) + 1;
        if (::strncasecmp(head.c_str() + begin, name.data(), name.size()) != 0) {
            result.append(head, begin, end - begin);
        }
        begin = end;
    }
    return result;
}

// A connection whose request has been read, and which is written to for a limited time.
class Connection final : public httplib::Stream {
public:
    Connection(int socket, int stop, std::string head)
        : socket_(socket), stop_(stop), head_(std::move(head)) {}

    bool is_readable() const override { return read_ < head_.size(); }
    bool is_writable() const override { return true; }

    ssize_t read(char* to, std::size_t room) override {
        const std::size_t count = head_.copy(to, room, read_);
        read_ += count;
        return static_cast<ssize_t>(count);
    }

    ssize_t write(const char* from, std::size_t size) override {
        if (!waitFor(socket_, POLLOUT, stop_, latest_)) {
            return -1;
        }
        return ::send(socket_, from, size, MSG_NOSIGNAL | MSG_DONTWAIT);
    }

    void get_remote_ip_and_port(std::string&, int&) const override {}
    void get_local_ip_and_port(std::string&, int&) const override {}

    // The library asks in order to refuse what select() cannot wait for, which is not used here.
    socket_t socket() const override { return 0; }

private:
    int socket_;
    int stop_;
    std::string head_;
    std::size_t read_ = 0;
    Clock::time_point latest_ = Clock::now() + longestAnswer;
};

// A pool of threads that has its caller wait when there is too much to do.
class BoundedPool final : public httplib::TaskQueue {
public:
    void enqueue(std::function<void()> task) override {
        room_.acquire();
        pool_.enqueue([this, task = std::move(task)] {
            task();
            room_.release();
        });
    }

    void shutdown() override { pool_.shutdown(); }

private:
    std::counting_semaphore<mostConnections> room_{mostConnections};
    httplib::ThreadPool pool_{threads};
};

// Whether only programs of this machine reach `host`.
bool isLoopback(const std::string& host) {
    return host == "localhost" || host == "::1" || host.starts_with("127.");
}

}  // namespace

ListenAddress ListenAddress::parse(const std::string& text) {
    const auto fail = [&text] {
        throw std::invalid_argument("\"" + text + "\" is no address such as 127.0.0.1:8080");
    };
    const std::size_t colon = text.rfind(':');
    if (colon == std::string::npos || colon == 0) {
        fail();
    }
    ListenAddress address{text.substr(0, colon), 0};
    const char* const end = text.data() + text.size();
    const auto [parsed, error] = std::from_chars(text.data() + colon + 1, end, address.port);
    if (error != std::errc() || parsed != end) {
        fail();
    }
    if (address.host.starts_with('[') && address.host.ends_with(']')) {
        address.host = address.host.substr(1, address.host.size() - 2);
    } else if (address.host.find(':') != std::string::npos) {
        fail();
    }
    return address;
}

std::string ListenAddress::authority() const {
    const std::string name = host.find(':') == std::string::npos ? host : "[" + host + "]";
    return name + (port == 80 ? "" : ":" + std::to_string(port));
}

// The library's server. The library reads heads of any length, from any number of clients and for
// as long as they like; here it gets to see each when it has been read within limits.
class WebServer::Server final : public httplib::Server {
public:
    explicit Server(const std::filesystem::path& folder)
        : folder_(folder), stop_(::eventfd(0, EFD_CLOEXEC)) {
        if (stop_.get() < 0) {
            throw std::system_error(errno, std::generic_category(), "cannot make an eventfd");
        }
        // The library's default would share the port with other programs.
        set_socket_options([](socket_t socket) {
            const int yes = 1;
            ::setsockopt(socket, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
        });
        set_default_headers({{"Content-Security-Policy", contentPolicy},
                             {"X-Content-Type-Options", "nosniff"},
                             {"Referrer-Policy", "no-referrer"},
                             {"Cross-Origin-Resource-Policy", "same-origin"},
                             {"Cache-Control", "no-cache"},
                             {"Accept-Ranges", "none"}});
        set_pre_routing_handler(
            [this](const httplib::Request& request, httplib::Response& response) {
                answer(request, response);
                return HandlerResponse::Handled;
            });
    }

    // Returns the port.
    int bind(const ListenAddress& address) {
        if (address.port == 0) {
            return bind_to_any_port(address.host);
        }
        return bind_to_port(address.host, address.port) ? address.port : -1;
    }

    // From now on, answers only what is meant for `authority`, a host and its port.
    void answerOnlyFor(const std::string& authority) { authority_ = authority; }

    // Has the connections end.
    void cutOff() { ::eventfd_write(stop_.get(), 1); }

private:
    bool process_and_close_socket(socket_t socket) override {
        const platform::FileDescriptor closed(socket);
        try {
            const std::optional<std::string> head = readHead(socket, stop_.get());
            if (!head) {
                return false;
            }
            Connection connection(socket, stop_.get(), withoutRanges(*head));
            bool isClosed = true;
            return process_request(connection, true, isClosed, nullptr);
        } catch (const std::exception& error) {
            spdlog::error("a request for a web page failed: {}", error.what());
            return false;
        }
    }

    void answer(const httplib::Request& request, httplib::Response& response) const {
        if (request.method != "GET" && request.method != "HEAD") {
            response.set_header("Allow", "GET, HEAD");
            return refuse(response, 405, "Only GET and HEAD are answered here.\n");
        }
        if (!authority_.empty() && request.get_header_value("Host") != authority_) {
            return refuse(response, 421, "This is " + authority_ + " and no other server.\n");
        }
        std::optional<WebFolder::File> file = folder_.read(request.path);
        if (!file) {
            return refuse(response, 404, "There is no such file.\n");
        }
        response.set_content(file->content, file->type);
    }

    static void refuse(httplib::Response& response, int status, const std::string& reason) {
        response.status = status;
        response.set_content(reason, "text/plain; charset=utf-8");
    }

    WebFolder folder_;
    platform::FileDescriptor stop_;  // Becomes readable when the connections are to end.
    std::string authority_;
};

WebServer::WebServer(const std::filesystem::path& folder, const ListenAddress& address)
    : server_(std::make_unique<Server>(folder)) {
    errno = 0;
    const int port = server_->bind(address);
    if (port <= 0) {
        throw std::runtime_error("cannot listen at " + address.authority() +
                                 (errno == 0 ? "" : ": " + std::generic_category().message(errno)) +
                                 "; choose another address with --listen");
    }
    const ListenAddress bound{address.host, static_cast<std::uint16_t>(port)};
    origin_ = bound.origin();
    if (isLoopback(bound.host)) {
        server_->answerOnlyFor(bound.authority());
    }
}

WebServer::~WebServer() {
    server_->cutOff();
    server_->stop();
    if (thread_.joinable()) {
        thread_.join();
    }
}

void WebServer::start(std::function<void()> prepare) {
    std::promise<void> running;
    std::future<void> whenRunning = running.get_future();
    // The library asks for its pool of threads when it can be stopped.
    server_->new_task_queue = [&running] {
        auto pool = std::make_unique<BoundedPool>();
        running.set_value();
        return pool.release();
    };
    thread_ = std::thread([this, &running, prepare = std::move(prepare)] {
        try {
            prepare();
        } catch (...) {
            return running.set_exception(std::current_exception());
        }
        if (!server_->listen_after_bind()) {
            spdlog::error("the web server at {} has ended", origin_);
        }
    });
    whenRunning.get();
}

}  // namespace host
