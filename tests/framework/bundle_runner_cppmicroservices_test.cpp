// SPDX-License-Identifier: Apache-2.0
// What BundleRunner does when the system refuses CppMicroServices the threads that it needs.

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <pthread.h>

#include <atomic>
#include <cerrno>
#include <optional>

#include "framework/bundle_runner.h"
#include "tests/framework/sample_bundle_control.h"

namespace {

std::atomic<bool> isRefusing = false;
std::atomic<int> refused = 0;

}  // namespace

// In the place of the C library's, for all libraries of the process.
extern "C" __attribute__((visibility("default"))) int pthread_create(
    pthread_t* thread, const pthread_attr_t* attributes, void* (*run)(void*),
    void* argument) noexcept {
    if (isRefusing) {
        ++refused;
        return EAGAIN;
    }
    static const auto create =
        reinterpret_cast<decltype(&pthread_create)>(dlsym(RTLD_NEXT, "pthread_create"));
    return create(thread, attributes, run, argument);
}

namespace framework {
namespace {

TEST(BundleRunnerWithoutThreads, StopsItsBundleAndLeavesTheFramework) {
    sample::control() = {};
    std::optional<BundleRunner> runner(SAMPLE_BUNDLE);
    isRefusing = true;
    runner.reset();
    isRefusing = false;
    EXPECT_GT(refused, 0);
    EXPECT_EQ(sample::control().events.back(), "clear context");
}

}  // namespace
}  // namespace framework
