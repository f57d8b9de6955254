// SPDX-License-Identifier: Apache-2.0
// What happens to the command `stdio` when any of the system calls of its run fails: those of the
// bundle's loading, of its threads, of its requests and of the frames.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/syscall.h>

#include <cerrno>
#include <cstddef>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "host/exit_status.h"
#include "tests/host/commands/stdio_run.h"
#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace {

// What poll() is to the kernel; some processors have only the newer of the two calls.
#ifdef SYS_poll
constexpr int pollCall = SYS_poll;
#else
constexpr int pollCall = SYS_ppoll;
#endif

class StdioFaults : public test::StdioRun {
protected:
    void SetUp() override {
        ::mallopt(M_ARENA_MAX, 1);  // or the heaps of threads would look at the system's settings
        if (!test::canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
    }

    /// Runs the command with `decide` for each of its system calls.
    Outcome supervise(const std::function<int(int call, int index)>& decide) {
        return run([&](const auto& command) { test::supervise(command, decide); });
    }

    using Concerned = std::function<bool(int call, bool takesInput)>;

    /// Fails each of the calls `concerned`, in turn and with each of `errors`, and hands what came
    /// of it to `check`. The command takes input from the first time on that it has waited for it.
    void failEach(const Concerned& concerned, const std::vector<int>& errors,
                  const std::function<void(int call, const Outcome&)>& check) {
        long faults = 0;
        for (const auto& [call, count] : countCalls(concerned)) {
            for (int time = 0; time < count; ++time) {
                for (const int error : errors) {
                    SCOPED_TRACE("system call " + std::to_string(call) + ", time " +
                                 std::to_string(time) + ", errno " + std::to_string(error));
                    const std::size_t descriptors = test::openDescriptors();
                    check(call, fail(concerned, call, time, error, faults));
                    // A close that fails here is not made; the system's own frees the descriptor.
                    if (call != SYS_close) {
                        EXPECT_EQ(test::openDescriptors(), descriptors);
                    }
                    ASSERT_FALSE(HasFailure());
                }
            }
        }
        EXPECT_GE(faults, 3);
        RecordProperty("faults", std::to_string(faults));
        expectAllAnswers(run());
    }

    /// How often each of the calls `concerned` is made.
    std::map<int, int> countCalls(const Concerned& concerned) {
        std::map<int, int> counts;
        bool takesInput = false;
        supervise([&](int call, int) {
            counts[call] += concerned(call, takesInput) ? 1 : 0;
            takesInput = takesInput || call == pollCall;
            return 0;
        });
        return counts;
    }

    /// Runs the command with `error` for the call `failing`, when it is made once more after `time`
    /// times that are spared. There may be fewer: threads make their calls in no fixed order.
    Outcome fail(const Concerned& concerned, int failing, int time, int error, long& faults) {
        bool takesInput = false;
        return supervise([&](int call, int) {
            const bool isFault = call == failing && concerned(call, takesInput) && time-- == 0;
            takesInput = takesInput || call == pollCall;
            faults += isFault ? 1 : 0;
            return isFault ? error : 0;
        });
    }
};

TEST_F(StdioFaults, OfAnyCallEndItWithWholeFramesOrAFailure) {
    // glibc ends a process in which a thread cannot be registered.
    const auto concerned = [](int call, bool) { return call != SYS_rseq; };
    failEach(concerned, {EIO, ENOMEM, EMFILE}, [&](int call, const Outcome& outcome) {
        expectOrderlyEnd(outcome);
        const bool concernsStreams = call == SYS_read || call == SYS_writev || call == pollCall;
        if (concernsStreams && outcome.status == host::exitDone) {
            EXPECT_EQ(framesIn(outcome.output).size(), answers().size());
        }
    });
}

TEST_F(StdioFaults, ThatPassLoseNothing) {
    const auto isInterruptible = [](int call, bool takesInput) {
        return takesInput && (call == SYS_read || call == SYS_writev || call == pollCall);
    };
    failEach(isInterruptible, {EINTR}, [&](int, const Outcome& outcome) {
        expectAllAnswers(outcome);
        EXPECT_EQ(test::readFile(folder_ / "new"), "new");
    });
}

TEST_F(StdioFaults, OfAStreamThatIsNotReadyYetLoseNothing) {
    // The stored text is not at stake: files are always ready.
    failEach([](int call, bool takesInput) { return takesInput && call == SYS_writev; }, {EAGAIN},
             [&](int, const Outcome& outcome) { expectAllAnswers(outcome); });
}

}  // namespace
