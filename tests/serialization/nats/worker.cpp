// SPDX-License-Identifier: Apache-2.0
// A worker of NATS servers: the real bundle on the NATS bus, and nothing else.
//
//     nats_worker BUNDLE URL...
//
// Shuts down gracefully on SIGTERM.
#include <signal.h>

#include <chrono>
#include <exception>
#include <iostream>

#include "framework/bundle_runner.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/transport.h"

int main(int argc, char** argv) {
    using namespace platform::messaging;
    // Before there are threads, all of which are to leave this signal to the wait below.
    sigset_t ending;
    sigemptyset(&ending);
    sigaddset(&ending, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &ending, nullptr);
    signal(SIGPIPE, SIG_IGN);
    try {
        NatsOptions options;
        options.servers.assign(argv + 2, argv + argc);
        options.queueGroup = "workers";
        options.queueChannels = {readRequestChannel, writeRequestChannel};
        options.concurrentChannels = {readRequestChannel};
        options.connectTimeout = std::chrono::minutes(1);
        const auto bus = NatsBus::create(options);
        const auto client = bus->connect("worker").get();
        setTransport([bus](const std::string& name, const MessageServiceOptions&) {
            return bus->connect(name);
        });
        int status = 0;
        {
            framework::BundleRunner bundle(argv[1]);
            int number = 0;
            sigwait(&ending, &number);
            status = bus->drain(std::chrono::seconds(30)) ? 0 : 1;
        }
        setTransport({});  // which holds the bus
        return status;
    } catch (const std::exception& error) {
        std::cerr << "nats_worker: " << error.what() << '\n';
        return 1;
    }
}
