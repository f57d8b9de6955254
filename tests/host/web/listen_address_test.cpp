// SPDX-License-Identifier: Apache-2.0
#include "host/web/listen_address.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace {

using host::ListenAddress;

TEST(ListenAddress, IsAHostAndAPort) {
    EXPECT_EQ(ListenAddress::parse("127.0.0.1:8080").host, "127.0.0.1");
    EXPECT_EQ(ListenAddress::parse("127.0.0.1:8080").port, 8080);
    EXPECT_EQ(ListenAddress::parse("localhost:0").port, 0);
    EXPECT_EQ(ListenAddress::parse("[::1]:65535").host, "::1");
    for (const char* text : {"", "8080", ":8080", "localhost", "localhost:", "localhost:http",
                             "localhost:80 ", "localhost:65536", "localhost:-1", "::1:80"}) {
        EXPECT_THROW(ListenAddress::parse(text), std::invalid_argument) << text;
    }
}

TEST(ListenAddress, HasTheOriginThatBrowsersGiveIt) {
    EXPECT_EQ(ListenAddress::parse("127.0.0.1:8080").origin(), "http://127.0.0.1:8080");
    EXPECT_EQ(ListenAddress::parse("127.0.0.1:80").origin(), "http://127.0.0.1");
    EXPECT_EQ(ListenAddress::parse("[::1]:8080").origin(), "http://[::1]:8080");
}

}  // namespace
