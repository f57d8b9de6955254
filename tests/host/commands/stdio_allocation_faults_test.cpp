// SPDX-License-Identifier: Apache-2.0
// What happens to the command `stdio` when any of the allocations of its run fails.

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "tests/host/commands/stdio_run.h"
#include "tests/support/failing_malloc.h"

namespace {

using test::Failing;

struct CloseLibrary {
    void operator()(void* library) const { ::dlclose(library); }
};

class StdioAllocationFaults : public test::StdioRun, public testing::WithParamInterface<Failing> {
protected:
    ~StdioAllocationFaults() override { test::stopFailing(); }

private:
    // Stays loaded, because glibc ends a process that has no memory for a library's thread-local
    // variables.
    const std::unique_ptr<void, CloseLibrary> bundle_{::dlopen(SERIALIZATION_BUNDLE, RTLD_NOW)};
};

TEST_P(StdioAllocationFaults, EndItInAnOrderlyWay) {
    long faults = 0;
    for (long failing = 0, allocations = 1; failing <= allocations; ++failing) {
        SCOPED_TRACE("allocation " + std::to_string(failing));
        const std::size_t descriptors = test::openDescriptors();
        const Outcome outcome = run([&](const auto& command) {
            test::failAllocation(failing, GetParam());
            command();
            allocations = test::stopFailing();
        });
        expectOrderlyEnd(outcome);
        EXPECT_EQ(test::openDescriptors(), descriptors);
        ASSERT_FALSE(HasFailure());
        faults += failing < allocations ? 1 : 0;
    }
    EXPECT_GT(faults, 100);
    RecordProperty("faults", std::to_string(faults));
    expectAllAnswers(run());
}

INSTANTIATE_TEST_SUITE_P(Of, StdioAllocationFaults,
                         testing::Values(Failing::one, Failing::allFromThere),
                         [](const auto& test) {
                             return test.param == Failing::one ? "One" : "AllFromThere";
                         });

}  // namespace
