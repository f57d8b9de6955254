// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_process.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <stdexcept>
#include <string>

#include "tests/support/temporary_directory.h"

namespace {

using host::NatsProcess;
using std::chrono::milliseconds;

// A program in the server's place, whose file of ports the test writes.
class NatsProcessPorts : public ::testing::Test {
protected:
    NatsProcessPorts() {
        write("server", "#!/bin/sh\nexec sleep 1000\n");
        ::chmod((folder_ / "server").c_str(), S_IRWXU);
    }

    void write(const std::string& name, const std::string& text) {
        test::writeFile(folder_ / name, text);
    }

    NatsProcess start() const { return {folder_ / "server", folder_ / "conf", -1}; }

private:
    const test::TemporaryDirectory folder_;
};

TEST_F(NatsProcessPorts, AreKnownWhenTheirFileIsWhole) {
    const std::string text =
        R"({"nats":["nats://127.0.0.1:4222"],"websocket":["ws://127.0.0.1:65535"]})";
    NatsProcess process = start();
    EXPECT_FALSE(process.ports());
    for (std::size_t size = 0; size < text.size(); ++size) {
        write("server_1.ports", text.substr(0, size));
        EXPECT_FALSE(process.ports()) << text.substr(0, size);
    }
    write("server_1.ports", text);
    ASSERT_TRUE(process.ports());
    EXPECT_EQ(process.ports()->client, 4222);
    EXPECT_EQ(process.ports()->webSocket, 65535);
}

TEST_F(NatsProcessPorts, OfAnotherShapeAreNone) {
    NatsProcess process = start();
    for (const char* text :
         {"", "[]", R"({"nats":["nats://127.0.0.1:4222"]})", R"({"nats":[],"websocket":[]})",
          R"({"nats":"nats://127.0.0.1:4222","websocket":"ws://127.0.0.1:1"})",
          R"({"nats":[4222],"websocket":[1]})",
          R"({"nats":["nats://127.0.0.1:"],"websocket":["ws://127.0.0.1:1"]})",
          R"({"nats":["nats://127.0.0.1:65536"],"websocket":["ws://127.0.0.1:1"]})",
          R"({"nats":["nats://127.0.0.1:1/"],"websocket":["ws://127.0.0.1:1"]})"}) {
        write("server_1.ports", text);
        EXPECT_FALSE(process.ports()) << text;
    }
}

TEST_F(NatsProcessPorts, OfAnEarlierRunAreForgotten) {
    write("server_1.ports", R"({"nats":["nats://127.0.0.1:1"],"websocket":["ws://127.0.0.1:2"]})");
    EXPECT_FALSE(start().ports());
}

TEST(FindNatsServer, NamesThePackageWhenThereIsNone) {
    try {
        host::findNatsServer("/no/such/program");
        FAIL() << "a program that is not there is found";
    } catch (const std::runtime_error& error) {
        EXPECT_EQ(std::string(error.what()),
                  "there is no program /no/such/program; the Debian package nats-server has one");
    }
}

}  // namespace
