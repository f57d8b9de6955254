// SPDX-License-Identifier: Apache-2.0
// What happens when any of the system calls of the bundle's start, or of its end, fails:
// those of the library's loading and of the threads that wait for requests.

#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/syscall.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstddef>
#include <exception>
#include <filesystem>
#include <functional>
#include <iterator>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/process_state.h"
#include "tests/support/running_bundle.h"
#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::messaging::InProcessBus;
using platform::messaging::setTransport;

class StartFaults : public testing::Test {
protected:
    void SetUp() override {
        ::mallopt(M_ARENA_MAX, 1);  // or the heaps of threads would look at the system's settings
        if (UNDER_SANITIZERS) {
            GTEST_SKIP() << "the sanitizers make calls of their own for each thread";
        }
        if (!test::canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
        setTransport([this](const std::string& name, const auto&) { return bus_->connect(name); });
    }

    ~StartFaults() override { setTransport({}); }

    /// Starts and ends the bundle, and notes why it did not start.
    std::function<void()> startAndEnd(std::optional<std::string>& failure) {
        return [&failure] {
            failure.reset();
            try {
                const framework::BundleRunner runner(SERIALIZATION_BUNDLE);
            } catch (const std::exception& error) {
                failure = error.what();
            }
        };
    }

private:
    std::shared_ptr<InProcessBus> bus_ = InProcessBus::create();
};

TEST_F(StartFaults, OfAnyCallEndTheStartWithAReasonOrLeaveItDone) {
    std::optional<std::string> failure;
    startAndEnd(failure)();  // what is done only once in a process is done now
    ASSERT_EQ(failure, std::nullopt);
    const std::vector<int> calls = test::callsOf(startAndEnd(failure));
    const std::size_t threadsBefore = test::listedThreads();
    int faults = 0;
    int failedStarts = 0;
    for (std::size_t failing = 0; failing < calls.size(); ++failing) {
        for (const int error : {EIO, ENOMEM, EMFILE, EAGAIN}) {
            SCOPED_TRACE("call " + std::to_string(failing) + ", errno " + std::to_string(error));
            const std::size_t descriptors = test::openDescriptors();
            int failed = 0;
            test::supervise(startAndEnd(failure), [&](int call, int index) {
                // glibc ends a process in which a thread cannot be registered.
                if (static_cast<std::size_t>(index) != failing || call == SYS_rseq) {
                    return 0;
                }
                failed = call;
                ++faults;
                return error;
            });
            failedStarts += failure ? 1 : 0;
            EXPECT_NE(failure, "");
            // A close that fails here is not made; the system's own frees the descriptor.
            if (failed != SYS_close) {
                EXPECT_EQ(test::openDescriptors(), descriptors);
            }
            EXPECT_TRUE(test::comesToThreads(threadsBefore));
            ASSERT_FALSE(HasFailure());
        }
    }
    EXPECT_GT(failedStarts, 10);
    RecordProperty("faults", std::to_string(faults));

    const test::TemporaryDirectory folder;
    test::writeFile(folder / "file", "text");
    test::RunningBundle bundle;
    const auto answers = bundle.read(folder / "file", "text/plain");
    ASSERT_EQ(answers.size(), 1U);
    EXPECT_EQ(answers[0].payload, R"({"data":"text","status":true})");
}

}  // namespace
