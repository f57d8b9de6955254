// SPDX-License-Identifier: Apache-2.0
#include "host/limits/freed_memory.h"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <cstring>
#include <memory>
#include <thread>

namespace {

// The pages that the thread is given by the system while it takes, uses and frees a document's
// memory.
long pagesForADocument() {
    constexpr std::size_t size = std::size_t{11} << 20U;
    rusage before{};
    rusage after{};
    ::getrusage(RUSAGE_THREAD, &before);
    {
        const auto memory = std::make_unique_for_overwrite<char[]>(size);
        std::memset(memory.get(), 'x', size);
        // Or the compiler leaves it all out.
        asm volatile("" : : "r"(memory.get()) : "memory");
    }
    ::getrusage(RUSAGE_THREAD, &after);
    return after.ru_minflt - before.ru_minflt;
}

TEST(FreedMemory, IsUsedAgainByTheNextRequestOfAThread) {
    if (UNDER_SANITIZERS) {
        GTEST_SKIP() << "the sanitizers bring a malloc of their own";
    }
    host::keepFreedMemory();
    std::thread([] {
        pagesForADocument();
        EXPECT_LT(pagesForADocument(), 100);
    }).join();
}

}  // namespace
