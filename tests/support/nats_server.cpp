// SPDX-License-Identifier: Apache-2.0
#include "tests/support/nats_server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <chrono>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <thread>

#include "platform/posix/file_descriptor.h"
#include "platform/posix/system_error.h"

namespace test {
namespace {

sockaddr_in loopback(int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

platform::FileDescriptor makeSocket() {
    platform::FileDescriptor made(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (made.get() < 0) {
        platform::throwSystemError("no socket can be made");
    }
    return made;
}

bool takesConnections(int port) {
    const platform::FileDescriptor probe = makeSocket();
    const sockaddr_in address = loopback(port);
    return ::connect(probe.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
}

}  // namespace

int freePort() {
    const platform::FileDescriptor probe = makeSocket();
    sockaddr_in address = loopback(0);
    socklen_t size = sizeof address;
    if (::bind(probe.get(), reinterpret_cast<const sockaddr*>(&address), size) != 0 ||
        ::getsockname(probe.get(), reinterpret_cast<sockaddr*>(&address), &size) != 0) {
        platform::throwSystemError("no port is free");
    }
    return ntohs(address.sin_port);
}

NatsServer::NatsServer(const std::string& configuration)
    : configuration_(configuration), port_(freePort()) {
    start();
}

void NatsServer::start() {
    const std::string file = folder_ / "server.conf";
    const std::string log = folder_ / "log";
    std::ofstream(file) << "listen: \"127.0.0.1:" << port_ << "\"\n" << configuration_ << '\n';
    process_.emplace(std::vector<std::string>{"nats-server", "-c", file, "-l", log});
    waitUntilReady();
}

void NatsServer::startWith(const std::string& configuration) {
    configuration_ = configuration;
    start();
}

void NatsServer::waitUntilReady() {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (!takesConnections(port_)) {
        if (process_->hasEnded()) {
            throw std::runtime_error("nats-server ended at once: " + log());
        }
        if (std::chrono::steady_clock::now() > deadline) {
            throw std::runtime_error("nats-server takes no connections: " + log());
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
}

void NatsServer::kill() {
    process_.reset();
}

std::string NatsServer::log() const {
    std::ifstream file(folder_ / "log");
    return {std::istreambuf_iterator<char>(file), {}};
}

}  // namespace test
