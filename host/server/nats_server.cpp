// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_server.h"

#include <fcntl.h>
#include <poll.h>
#include <spdlog/spdlog.h>
#include <sys/stat.h>

#include <algorithm>
#include <chrono>
#include <exception>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "host/server/client_delivery.h"
#include "host/standard_streams.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// How long the server may take to be ready.
constexpr milliseconds longestStart{30'000};

// How long clients may take to read their answers before the server is stopped.
constexpr milliseconds longestDelivery{10'000};

// How often to check whether the server is ready.
constexpr milliseconds readyInterval{10};

// How long to wait before the server is started again: twice as long each time, from the shortest
// to the longest pause, and the shortest again after the server has run for a while.
constexpr milliseconds shortestPause{50};
constexpr milliseconds longestPause{5'000};
constexpr milliseconds longEnoughRun{10'000};

bool isReadable(int fd, milliseconds timeout) {
    pollfd waited{fd, POLLIN, 0};
    return ::poll(&waited, 1, static_cast<int>(timeout.count())) > 0;
}

void writePrivateFile(const std::filesystem::path& file, std::string_view text) {
    const platform::FileDescriptor to(
        ::open(file.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, S_IRUSR | S_IWUSR));
    if (to.get() < 0) {
        platform::throwSystemError(file.c_str());
    }
    writeAll(to.get(), {text});
}

}  // namespace

NatsServer::NatsServer(NatsServerOptions options, const PrivateFolder& folder)
    : program_(findNatsServer(options.program)), folder_(folder) {
    configuration_.runtimeFolder = folder_.path();
    configuration_.port = options.port;
    configuration_.webSocketPort = options.webSocketPort;
    configuration_.users = {{"worker", makePassword()}, {"editor", makePassword()}};
    configuration_.allowedOrigins = std::move(options.allowedOrigins);

    std::promise<void> ready;
    std::future<void> whenReady = ready.get_future();
    supervisor_ = std::thread(&NatsServer::supervise, this, std::move(ready));
    try {
        whenReady.get();
    } catch (...) {
        supervisor_.join();
        throw;
    }
}

platform::messaging::NatsOptions NatsServer::workerConnection() const {
    platform::messaging::NatsOptions options;
    options.servers = {"nats://" + address()};
    options.user = configuration_.users.worker.user;
    options.password = configuration_.users.worker.password;
    return options;
}

NatsServer::~NatsServer() {
    stop_.set();
    supervisor_.join();
}

void NatsServer::supervise(std::promise<void> ready) {
    bool hasBeenReady = false;
    const auto whenReady = [&] {
        spdlog::info("nats-server takes connections at {} and, of browsers, at {}", address(),
                     webSocketAddress());
        if (!std::exchange(hasBeenReady, true)) {
            ready.set_value();
        }
    };
    milliseconds pause = shortestPause;
    for (;;) {
        const Clock::time_point start = Clock::now();
        const std::optional<std::string> end = runOnce(whenReady);
        if (!end) {
            break;
        }
        if (!hasBeenReady) {
            ready.set_exception(std::make_exception_ptr(
                std::runtime_error("nats-server does not start (" + *end + ")")));
            return;
        }
        if (Clock::now() - start > longEnoughRun) {
            pause = shortestPause;
        }
        spdlog::warn("nats-server has ended ({}) and is started again", *end);
        if (isReadable(stop_.descriptor(), pause)) {
            break;
        }
        pause = std::min(2 * pause, longestPause);
    }
    // On this thread, since the one that made the folder may be confined by now.
    folder_.remove();
}

// Runs the server until it ends. Returns the reason; nothing when it was stopped on purpose.
std::optional<std::string> NatsServer::runOnce(const std::function<void()>& whenReady) {
    using State = NatsProcess::State;
    try {
        const std::filesystem::path file = folder_.path() / "nats-server.conf";
        writePrivateFile(file, configurationText(configuration_));
        NatsProcess process(program_, file, stop_.descriptor());
        State state = State::runs;
        const Clock::time_point latest = Clock::now() + longestStart;
        while (state == State::runs && !process.ports()) {
            if (Clock::now() > latest) {
                return "it is not ready after " + std::to_string(longestStart.count()) + " ms";
            }
            state = process.follow(readyInterval);
        }
        if (state == State::runs) {
            keepPorts(*process.ports());
            whenReady();
            state = process.follow(NatsProcess::forever);
        }
        if (state == State::isToStop) {
            process.followUntil(std::async(std::launch::async, [this] { waitForClients(); }));
            process.end();
            return std::nullopt;
        }
        return process.collect();
    } catch (const std::exception& error) {
        return error.what();
    }
}

// Makes a restarted server take the same ports.
void NatsServer::keepPorts(const NatsPorts& ports) {
    if (configuration_.port == 0 || configuration_.webSocketPort == 0) {
        configuration_.port = ports.client;
        configuration_.webSocketPort = ports.webSocket;
    }
}

void NatsServer::waitForClients() const {
    try {
        if (!waitForDelivery(workerConnection(),
                             {configuration_.port, configuration_.webSocketPort},
                             longestDelivery)) {
            spdlog::warn("clients have not taken their answers after {} s and do not get them",
                         longestDelivery.count() / 1000);
        }
    } catch (const std::exception& error) {
        spdlog::warn("clients may not get their last answers: {}", error.what());
    }
}

}  // namespace host
