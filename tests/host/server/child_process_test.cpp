// SPDX-License-Identifier: Apache-2.0
#include "host/server/child_process.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <string>
#include <system_error>
#include <vector>

namespace {

using host::ChildProcess;

// What `script` writes.
std::string outputOf(const std::string& script) {
    ChildProcess process("/bin/sh", {"-c", script});
    std::string text;
    std::array<char, 4096> chunk{};
    ssize_t count = 0;
    while ((count = ::read(process.output(), chunk.data(), chunk.size())) > 0) {
        text.append(chunk.data(), static_cast<std::size_t>(count));
    }
    return text;
}

TEST(ChildProcess, HasTheHostsEnvironmentButForWhatTunesTheHostsMemory) {
    ::setenv("GLIBC_TUNABLES", "glibc.malloc.hugetlb=1", 1);
    ::setenv("SOMETHING_ELSE", "kept", 1);
    EXPECT_EQ(outputOf("echo \"$GLIBC_TUNABLES $SOMETHING_ELSE\""), " kept\n");
    ::unsetenv("GLIBC_TUNABLES");
    ::unsetenv("SOMETHING_ELSE");
}

TEST(ChildProcess, HasTheVariablesThatItIsGivenInThePlaceOfTheHosts) {
    ::setenv("GIVEN", "the host's", 1);
    ChildProcess process("/bin/sh", {"-c", "[ \"$GIVEN\" = 'its own' ]"}, {"GIVEN=its own"});
    EXPECT_EQ(process.collect(), "exit status 0");
    ::unsetenv("GIVEN");
}

TEST(ChildProcess, IsNotHeldToTheHostsMemoryLimit) {
    if (UNDER_SANITIZERS) {
        GTEST_SKIP() << "they take more address space than such a limit allows";
    }
    rlimit before{};
    ASSERT_EQ(::getrlimit(RLIMIT_DATA, &before), 0);
    rlimit limited = before;
    limited.rlim_cur = rlim_t{1} << 40U;
    ASSERT_EQ(::setrlimit(RLIMIT_DATA, &limited), 0);
    const std::string soft = outputOf("ulimit -S -d");
    const std::string hard = outputOf("ulimit -H -d");
    ASSERT_EQ(::setrlimit(RLIMIT_DATA, &before), 0);
    EXPECT_EQ(soft, hard);
    EXPECT_NE(soft, std::to_string((rlim_t{1} << 40U) / 1024) + "\n");
}

TEST(ChildProcess, WritesWhereTheHostReads) {
    EXPECT_EQ(outputOf("echo one; echo two >&2"), "one\ntwo\n");
}

TEST(ChildProcess, TellsHowItEnded) {
    EXPECT_EQ(ChildProcess("/bin/sh", {"-c", "exit 3"}).collect(), "exit status 3");
    EXPECT_EQ(ChildProcess("/bin/sh", {"-c", "kill -9 $$"}).collect(), "signal 9");
}

TEST(ChildProcess, ThatCannotBeRunIsAnError) {
    EXPECT_THROW(ChildProcess("/no/such/program", {}), std::system_error);
    EXPECT_THROW(ChildProcess("/etc/passwd", {}), std::system_error);
}

}  // namespace
