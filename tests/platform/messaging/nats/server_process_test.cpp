// SPDX-License-Identifier: Apache-2.0
// The servers of these tests do not outlive a test that is killed.

#include <gtest/gtest.h>
#include <signal.h>

#include <string>

#include "tests/platform/messaging/nats/bus_at_server.h"
#include "tests/support/temporary_directory.h"

namespace platform::messaging {
namespace {

TEST(NatsServerProcess, EndsWithTheTestThatStartedIt) {
    const test::TemporaryDirectory folder;
    EXPECT_EXIT(
        {
            const test::NatsServer server;
            test::writeFile(folder / "url", server.url());
            ::raise(SIGKILL);
        },
        testing::KilledBySignal(SIGKILL), "");
    NatsOptions options;
    options.servers = {test::readFile(folder / "url")};
    EXPECT_TRUE(waitUntil([&] {
        return !failureOf([&] { NatsBus::create(options)->connect("client").get(); }).empty();
    }));
}

}  // namespace
}  // namespace platform::messaging
