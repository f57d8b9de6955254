// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "host/limits/memory_limit.h"
#include "tests/host/host_program.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::hostCommand;
using test::Outcome;

constexpr std::uintmax_t kGigabyte = std::uintmax_t{1} << 30;

class MemoryLimit : public ::testing::Test {
protected:
    void SetUp() override {
        if (!LIMIT_MEMORY) {
            GTEST_SKIP() << "the sanitizers take more address space than there is memory";
        }
        test::writeFile(small, "text");
    }

    // A file of that size that takes no room on disk.
    std::string sparse(std::uintmax_t size) const {
        const std::filesystem::path file = folder / "sparse";
        test::writeFile(file, "");
        std::filesystem::resize_file(file, size);
        return file.string();
    }

    test::TemporaryDirectory folder;
    const std::string small = (folder / "small").string();
};

TEST_F(MemoryLimit, MakesAFileThatIsLargerAFailedRequest) {
    const Outcome outcome =
        test::run(hostCommand({"--memory-limit", "500MB", "read", sparse(kGigabyte), small}));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output,
              "{\"exception\":\"std::bad_alloc\",\"status\":false}\n"
              "{\"data\":\"text\",\"status\":true}\n");
}

TEST_F(MemoryLimit, IsThereWithoutBeingAskedFor) {
    test::Subprocess program(hostCommand({"stdio"}));
    program.write(test::framedReadRequest("1", small));
    EXPECT_NE(program.readSome(), "");  // it has started
    std::ifstream limits("/proc/" + std::to_string(program.id()) + "/limits");
    const std::string text{std::istreambuf_iterator<char>(limits), {}};
    EXPECT_THAT(text, testing::ContainsRegex("Max data size +" +
                                             std::to_string(host::defaultMemoryLimit()) + " "));
    EXPECT_GT(host::defaultMemoryLimit(), kGigabyte / 4);
}

TEST_F(MemoryLimit, LeavesTheLimitOfTextsToTellOfAFileThatIsTooLargeForOne) {
    const Outcome outcome =
        test::run(hostCommand({"--memory-limit", "500MB", "read", sparse(kGigabyte + 1), small}));
    EXPECT_EQ(outcome.output,
              "{\"exception\":\"The text is too large: 1073741825 bytes, at most 1073741824 are "
              "accepted\",\"status\":false}\n"
              "{\"data\":\"text\",\"status\":true}\n");
}

}  // namespace
