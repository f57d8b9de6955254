// SPDX-License-Identifier: Apache-2.0
#include "host/guard/save_locks.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <stdexcept>
#include <thread>

#include "tests/support/temporary_directory.h"

namespace {

using host::SaveLocks;
using namespace std::chrono_literals;

// Two of them are as those of two processes.
class SaveLocksTest : public testing::Test {
protected:
    // Expects that ours is waited for while theirs is held for a moment.
    void expectWait() {
        std::atomic<bool> isHeld = false;
        std::atomic<bool> isFree = false;
        std::thread other([&] {
            const SaveLocks::Held document = theirs_.hold("/a.txt");
            isHeld = true;
            isHeld.notify_one();
            std::this_thread::sleep_for(20ms);
            isFree = true;
        });
        isHeld.wait(false);
        {
            const SaveLocks::Held document = ours_.hold("/a.txt");
            EXPECT_TRUE(isFree);
        }
        other.join();
    }

    const test::TemporaryDirectory folder_;
    SaveLocks ours_{folder_ / "locks", 5s};
    SaveLocks theirs_{folder_ / "locks"};
};

TEST_F(SaveLocksTest, LetTheSavesOfOneDocumentWaitForThoseOfAnotherProcess) {
    expectWait();
}

TEST_F(SaveLocksTest, WaitOnceForAProcessThatHasStoppedUntilItGoesOn) {
    {
        const SaveLocks::Held held = theirs_.hold("/a.txt");
        const auto begin = std::chrono::steady_clock::now();
        for (int i = 0; i < 10; ++i) {
            EXPECT_THROW(ours_.hold("/a.txt"), std::runtime_error);
        }
        EXPECT_LT(std::chrono::steady_clock::now() - begin, 25s);  // ten long waits would take 50 s
        const SaveLocks::Held another = ours_.hold("/b.txt");
    }
    static_cast<void>(ours_.hold("/a.txt"));
    expectWait();
}

}  // namespace
