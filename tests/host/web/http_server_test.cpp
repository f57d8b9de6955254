// SPDX-License-Identifier: Apache-2.0
#include "host/web/http_server.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <csignal>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/posix/file_descriptor.h"
#include "tests/support/wait_until.h"

namespace {

using host::HttpAnswer;
using host::HttpLimits;
using host::HttpRequest;
using host::HttpServer;
using host::ListenAddress;
using platform::FileDescriptor;
using std::chrono::milliseconds;
using ::testing::AllOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::StartsWith;

constexpr const char* request = "GET / HTTP/1.1\r\nHost: x\r\n\r\n";

class Http : public ::testing::Test {
protected:
    // As in the program, so that a client that goes away is an error of the write.
    Http() { std::signal(SIGPIPE, SIG_IGN); }

    void start(HttpServer::Handler handler, const HttpLimits& limits = {}) {
        server_ = std::make_unique<HttpServer>(ListenAddress{"127.0.0.1", 0}, limits);
        server_->start([] {}, std::move(handler));
    }

    void startSaying(const std::string& body, const HttpLimits& limits = {}) {
        start(
            [body](const HttpRequest&) {
                return HttpAnswer{200, "text/plain", body, {}, {}};
            },
            limits);
    }

    void stop() { server_.reset(); }

    FileDescriptor connect() const {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(server_->address().port);
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        FileDescriptor socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
        // A small window, so that a large answer has to be read to be sent.
        const int window = 4096;
        ::setsockopt(socket.get(), SOL_SOCKET, SO_RCVBUF, &window, sizeof window);
        if (::connect(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) !=
            0) {
            throw std::runtime_error("no connection");
        }
        return socket;
    }

    std::string ask(std::string_view text) const {
        const FileDescriptor socket = connect();
        send(socket, text);
        return readToEnd(socket);
    }

    // Returns whether the connection took it.
    static bool send(const FileDescriptor& socket, std::string_view text) {
        return ::send(socket.get(), text.data(), text.size(), MSG_NOSIGNAL) ==
               static_cast<ssize_t>(text.size());
    }

    // What comes until the server ends the connection.
    static std::string readToEnd(const FileDescriptor& socket) {
        std::string text;
        std::array<char, 65536> chunk{};
        for (;;) {
            const ssize_t count = ::read(socket.get(), chunk.data(), chunk.size());
            if (count <= 0) {
                return text;
            }
            text.append(chunk.data(), static_cast<std::size_t>(count));
        }
    }

    static bool hasSomethingToRead(const FileDescriptor& socket) {
        pollfd waited{socket.get(), POLLIN, 0};
        return ::poll(&waited, 1, 0) > 0;
    }

    const HttpServer& server() const { return *server_; }

private:
    std::unique_ptr<HttpServer> server_;
};

TEST_F(Http, ARequestIsAnsweredByItsPathAndHost) {
    start([](const HttpRequest& asked) {
        return HttpAnswer{404,
                          "text/x",
                          std::string(asked.method) + " " + std::string(asked.path) + " " +
                              std::string(asked.host),
                          {},
                          {{"X-More", "yes"}}};
    });
    EXPECT_THAT(ask("GET /a%20b/%2e%2E?c=d HTTP/1.1\r\nHost: here:80\r\n\r\n"),
                AllOf(StartsWith("HTTP/1.1 404 "), HasSubstr("\r\nContent-Type: text/x\r\n"),
                      HasSubstr("\r\nX-More: yes\r\n"), HasSubstr("\r\nContent-Length: 19\r\n"),
                      EndsWith("\r\n\r\nGET /a b/.. here:80")));
}

TEST_F(Http, ANulInAPathCutsNothingOff) {
    start([](const HttpRequest& asked) {
        return HttpAnswer{200, "text/x", std::string(asked.path), {}, {}};
    });
    EXPECT_THAT(ask("GET /a%00b HTTP/1.1\r\nHost: x\r\n\r\n"), EndsWith("\r\n\r\n/a%00b"));
}

TEST_F(Http, AConnectionCarriesOneRequestAndItsBodyIsNoOther) {
    startSaying("answer");
    const std::string post =
        "POST / HTTP/1.1\r\nHost: x\r\nContent-Length: " + std::to_string(std::strlen(request)) +
        "\r\n\r\n" + request;
    for (const std::string& text : {std::string(request) + request, post}) {
        const std::string answer = ask(text);
        EXPECT_THAT(answer, AllOf(HasSubstr("\r\nConnection: close\r\n"), EndsWith("answer")));
        EXPECT_EQ(answer.find("HTTP/1.1 200"), answer.rfind("HTTP/1.1 200")) << answer;
    }
}

TEST_F(Http, AFileIsSentFromItsBeginningToItsEnd) {
    const std::string program = "/proc/self/exe";
    start([&](const HttpRequest&) {
        HttpAnswer answer;
        answer.file = FileDescriptor(::open(program.c_str(), O_RDONLY | O_CLOEXEC));
        return answer;
    });
    const std::string content =
        readToEnd(FileDescriptor(::open(program.c_str(), O_RDONLY | O_CLOEXEC)));
    const std::string answer = ask(request);
    const std::size_t head = answer.find("\r\n\r\n") + 4;
    EXPECT_TRUE(answer.substr(head) == content) << answer.size() - head << " of " << content.size();
}

TEST_F(Http, AFailureOfTheHandlerIsAnAnswer) {
    start([](const HttpRequest&) -> HttpAnswer { throw std::runtime_error("no"); });
    for (int count = 0; count < 2; ++count) {
        EXPECT_THAT(ask(request), StartsWith("HTTP/1.1 500 "));
    }
}

TEST_F(Http, AHeadThatDoesNotComeInTimeEndsTheConnectionHoweverItTrickles) {
    HttpLimits limits;
    limits.head = milliseconds(200);
    startSaying("answer", limits);
    const FileDescriptor silent = connect();
    const FileDescriptor slow = connect();
    send(slow, "GET / HTTP/1.1\r\nX: ");
    EXPECT_TRUE(test::waitUntil([&] { return !send(slow, "x"); }));
    EXPECT_EQ(readToEnd(silent), "");
}

TEST_F(Http, AnAnswerThatIsNotReadInTimeEndsTheConnection) {
    constexpr std::size_t size = 64U << 20U;
    HttpLimits limits;
    limits.answer = milliseconds(200);
    startSaying(std::string(size, 'x'), limits);
    const FileDescriptor slow = connect();
    send(slow, request);
    std::size_t total = 0;
    std::array<char, 1024> chunk{};
    ssize_t count = 0;
    while ((count = ::read(slow.get(), chunk.data(), chunk.size())) > 0) {
        total += static_cast<std::size_t>(count);
        std::this_thread::sleep_for(milliseconds(1));  // a reader slower than the time limit
    }
    EXPECT_LT(total, size);
}

TEST_F(Http, AHeadThatIsTooLongIsRefused) {
    startSaying("answer");
    for (const std::string& text : {"GET / HTTP/1.1\r\nX: " + std::string(1'000'000, 'x'),
                                    "GET /" + std::string(1'000'000, 'x') + " HTTP/1.1\r\n"}) {
        EXPECT_THAT(ask(text), Not(HasSubstr("answer")));
    }
    EXPECT_THAT(ask(request), EndsWith("answer"));
}

TEST_F(Http, SlowConnectionsKeepNobodyWaiting) {
    HttpLimits limits;
    limits.head = std::chrono::minutes(10);
    startSaying("answer", limits);
    std::vector<FileDescriptor> slow;
    for (int count = 0; count < 1000; ++count) {
        slow.push_back(connect());
        send(slow.back(), "GET / HT");
    }
    EXPECT_THAT(ask(request), EndsWith("answer"));
    for (const FileDescriptor& each : slow) {
        ASSERT_FALSE(hasSomethingToRead(each));  // Neither an answer nor an end.
    }
}

TEST_F(Http, AnAddressHasNoMoreConnectionsThanItMay) {
    HttpLimits limits;
    limits.connectionsOfAddress = 2;
    startSaying("answer", limits);
    const FileDescriptor one = connect();
    FileDescriptor two = connect();
    EXPECT_EQ(ask(request), "");
    two = {};
    // The server learns of the end in its own time.
    std::string answer;
    EXPECT_TRUE(test::waitUntil([&] { return !(answer = ask(request)).empty(); }));
    EXPECT_THAT(answer, EndsWith("answer"));
}

TEST_F(Http, ConnectionsBeyondTheMostWaitUntilOthersEnd) {
    HttpLimits limits;
    limits.connections = 2;
    limits.head = milliseconds(200);
    startSaying("answer", limits);
    const FileDescriptor one = connect();
    const FileDescriptor two = connect();
    EXPECT_THAT(ask(request), EndsWith("answer"));
}

TEST_F(Http, StoppingCutsConnectionsOff) {
    startSaying("answer");
    const FileDescriptor slow = connect();
    send(slow, "GET / HT");
    EXPECT_THAT(ask(request), EndsWith("answer"));
    stop();
    EXPECT_EQ(readToEnd(slow), "");
}

TEST_F(Http, AnAddressThatIsTakenIsToldOf) {
    startSaying("answer");
    try {
        const HttpServer second(server().address());
        FAIL() << "two servers at one address";
    } catch (const std::runtime_error& error) {
        EXPECT_EQ(std::string(error.what()), "cannot listen at " + server().address().authority() +
                                                 ": Address already in use");
    }
    EXPECT_THROW(HttpServer(ListenAddress{"no such host", 0}), std::runtime_error);
}

TEST_F(Http, WhatIsToBeDoneFirstCanFailTheStart) {
    HttpServer server(ListenAddress{"127.0.0.1", 0});
    EXPECT_THROW(server.start([] { throw std::runtime_error("no"); },
                              [](const HttpRequest&) { return HttpAnswer{}; }),
                 std::runtime_error);
}

}  // namespace
