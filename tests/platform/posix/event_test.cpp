// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/event.h"

#include <gtest/gtest.h>
#include <poll.h>

#include <thread>

namespace platform {
namespace {

bool isReadable(const Event& event, int milliseconds) {
    pollfd waited{event.descriptor(), POLLIN, 0};
    return ::poll(&waited, 1, milliseconds) == 1;
}

TEST(Event, IsReadableFromThenOnThatItIsSet) {
    const Event event;
    EXPECT_FALSE(isReadable(event, 0));
    std::jthread setter([&] { event.set(); });
    EXPECT_TRUE(isReadable(event, -1));
    event.set();
    EXPECT_TRUE(isReadable(event, 0));
}

}  // namespace
}  // namespace platform
