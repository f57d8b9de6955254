// SPDX-License-Identifier: Apache-2.0
#include "host/metrics/health_check.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <future>
#include <memory>

#include "tests/support/temporary_directory.h"
#include "tests/support/wait_until.h"

namespace {

using host::HealthCheck;
using std::chrono::milliseconds;

bool comesToSay(const HealthCheck& check, bool expected) {
    return test::waitUntil([&] { return check.isHealthy() == expected; });
}

TEST(HealthCheck, SaysWhetherTheFoldersCanBeRead) {
    const test::TemporaryDirectory parent;
    const std::filesystem::path folder = parent / "folder";
    std::filesystem::create_directory(folder);
    const HealthCheck check(
        [&] {
            return host::areReadable({parent.path(), folder});
        },
        milliseconds(50));
    EXPECT_TRUE(comesToSay(check, true));
    std::filesystem::remove(folder);
    EXPECT_TRUE(comesToSay(check, false));
    std::filesystem::create_directory(folder);
    EXPECT_TRUE(comesToSay(check, true));
}

TEST(HealthCheck, FailsWhileALookDoesNotEndAndCanBeEndedAllTheSame) {
    // Both belong to the check's thread too, which may outlive the test.
    const auto isStuck = std::make_shared<std::atomic<bool>>(false);
    const auto release = std::make_shared<std::promise<void>>();
    {
        const HealthCheck check(
            [isStuck, released = release->get_future().share(), release] {
                if (*isStuck) {
                    released.wait();
                }
                return true;
            },
            milliseconds(50));
        EXPECT_TRUE(comesToSay(check, true));
        *isStuck = true;
        EXPECT_TRUE(comesToSay(check, false));
    }
    release->set_value();
}

}  // namespace
