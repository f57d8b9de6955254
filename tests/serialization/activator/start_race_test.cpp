// SPDX-License-Identifier: Apache-2.0
// The bundle's start and end against each other and against requests that come in all the time. The
// one thing not allowed is to destroy the activator while its start-up still runs.

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <thread>

#include "futures/future.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/transport.h"
#include "tests/serialization/activator/loaded_bundle.h"

namespace {

using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;
using platform::messaging::MessageService;
using platform::messaging::setTransport;
using test::LoadedBundle;
using Client = std::shared_ptr<MessageService>;

class StartRace : public testing::Test {
protected:
    ~StartRace() override {
        isDone_ = true;
        asking_.join();
        setTransport({});
    }

    /// Waits for an answer to a request that is yet to come.
    void waitForAnswer() const {
        // An answer to one that was sent before may be on its way.
        const int enough = answers_ + 2;
        while (answers_ < enough) {
            std::this_thread::yield();
        }
    }

    const std::shared_ptr<InProcessBus> bus_ = InProcessBus::create();
    LoadedBundle library_;  // stays loaded

private:
    void ask() {
        const Client client = bus_->connect("client").get();
        const auto subscription =
            client
                ->subscribe("/zpr/service/readResponse/1", [&](const JsonMessage&) { ++answers_; })
                .get();
        while (!isDone_) {
            client
                ->publish(platform::messaging::readRequestChannel,
                          platform::DataBuffer::copyOf(
                              R"({"rtcId":"1","contentType":"","filePath":"/no such file"})"))
                .get();
            bus_->waitUntilQueuedAtMost(2, 10'000);
        }
    }

    std::atomic<int> answers_ = 0;
    std::atomic<bool> isDone_ = false;
    std::thread asking_{[this] { ask(); }};
};

TEST_F(StartRace, OfTheCreationsResolutionWithTheStartConnectsWhicheverComesFirst) {
    for (int i = 0; i < 200; ++i) {
        futures::Promise<Client> creation;
        setTransport([&](const std::string&, const auto&) { return creation.getFuture(); });
        LoadedBundle bundle;
        std::thread resolver(
            [&] { creation.setValue(bus_->connect("EditorSerialization").get()); });
        bundle.start();
        // Start-up runs on one of the two threads.
        resolver.join();
        if (i % 4 == 0) {
            waitForAnswer();
        }
    }
}

TEST_F(StartRace, OfALaterStartWithRequestsLeavesTheNewerServiceObject) {
    setTransport([this](const std::string& name, const auto&) { return bus_->connect(name); });
    LoadedBundle bundle;
    for (int i = 0; i < 100; ++i) {
        bundle.start();
        if (i % 4 == 0) {
            waitForAnswer();
        }
    }
}

TEST_F(StartRace, OfTheEndWithACreationThatIsCancelledIsHarmless) {
    for (int i = 0; i < 100; ++i) {
        auto creation = std::make_unique<futures::Promise<Client>>();
        setTransport([&](const std::string&, const auto&) { return creation->getFuture(); });
        LoadedBundle bundle;
        bundle.start();
        std::thread canceller([&] { creation.reset(); });
        bundle.destroyActivator();
        canceller.join();
    }
}

}  // namespace
