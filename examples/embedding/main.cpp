// SPDX-License-Identifier: Apache-2.0
// A complete small host: starts the bundle on a message bus of its own, has it write a text and
// read it back, and prints both answers. A build that finds CppMicroServices runs the bundle in
// that framework, any other in the loader that is installed with the bundle.
//
//     cmake -B build -DCMAKE_PREFIX_PATH=<prefix> && cmake --build build && build/embedding

#include <chrono>
#include <exception>
#include <future>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>

#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/transport.h"

#if __has_include(<cppmicroservices/FrameworkFactory.h>)

#include <cppmicroservices/Bundle.h>
#include <cppmicroservices/BundleContext.h>
#include <cppmicroservices/Framework.h>
#include <cppmicroservices/FrameworkEvent.h>
#include <cppmicroservices/FrameworkFactory.h>

class RunningBundle {
public:
    explicit RunningBundle(const std::string& file) {
        framework_.Start();
        framework_.GetBundleContext().InstallBundles(file).at(0).Start();
    }

    void stop() {
        framework_.Stop();
        framework_.WaitForStop(std::chrono::milliseconds::zero());  // however long it takes
    }

private:
    cppmicroservices::Framework framework_ = cppmicroservices::FrameworkFactory().NewFramework();
};

#else

#include "framework/bundle_runner.h"
using RunningBundle = framework::BundleRunner;

#endif

namespace messaging = platform::messaging;

namespace {

// The "rtcId" of the requests, which says whom to answer. A host with several requests under way
// gives each its own.
const std::string id = "1";

// Publishes `request` and waits for its answer, which comes on a thread of the bus.
std::string ask(messaging::MessageService& client, const std::string& requestChannel,
                const std::string& responsePrefix, const std::string& request) {
    std::promise<std::string> answer;
    const auto subscription = client
                                  .subscribe(responsePrefix + id,
                                             [&](const messaging::JsonMessage& message) {
                                                 answer.set_value(std::string(message.payload()));
                                             })
                                  .get();
    client.publish(requestChannel, platform::DataBuffer::copyOf(request)).get();
    std::future<std::string> received = answer.get_future();
    if (received.wait_for(std::chrono::seconds(30)) != std::future_status::ready) {
        throw std::runtime_error("no answer to " + request);
    }
    return received.get();
}

void run() {
    // What the bundle asks for its message service. A host with a message bus of its own returns
    // its implementation of MessageService here.
    const auto bus = messaging::InProcessBus::create();
    messaging::setTransport(
        [bus](const std::string& clientName, const messaging::MessageServiceOptions&) {
            return bus->connect(clientName);
        });
    RunningBundle bundle(BUNDLE);

    const auto client = bus->connect("embedding").get();
    std::cout << ask(*client, messaging::writeRequestChannel, messaging::writeResponsePrefix,
                     R"({"rtcId":"1","contentType":"text/plain","filePath":"embedding.txt",)"
                     R"("encoding":"UTF-8","content":"Grüße aus dem Editor"})")
              << '\n'
              << ask(*client, messaging::readRequestChannel, messaging::readResponsePrefix,
                     R"({"rtcId":"1","contentType":"text/plain","filePath":"embedding.txt"})")
              << '\n';

    // Requests that are still queued now would be dropped: the service object goes away in stop.
    bundle.stop();
}

}  // namespace

int main() {
    try {
        run();
        return 0;
    } catch (const std::exception& error) {
        std::cerr << error.what() << '\n';
        return 1;
    }
}
