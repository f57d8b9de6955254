// SPDX-License-Identifier: Apache-2.0
#include "tests/support/lease_holder.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <ctime>

namespace test {
namespace {

// What the process does, with nothing that is unsafe after a fork of a process with threads.
[[noreturn]] void holdLease(const char* path, const std::optional<timespec>& delay, int told) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    sigset_t wanted;
    sigemptyset(&wanted);
    sigaddset(&wanted, SIGIO);
    ::sigprocmask(SIG_BLOCK, &wanted, nullptr);
    const int file = ::open(path, O_RDWR | O_CLOEXEC);
    const char held = ::fcntl(file, F_SETLEASE, F_WRLCK) == 0 ? 'y' : 'n';
    if (::write(told, &held, 1) != 1) {
        ::_exit(1);
    }
    ::sigwaitinfo(&wanted, nullptr);
    if (delay) {
        ::nanosleep(&*delay, nullptr);
        ::fcntl(file, F_SETLEASE, F_UNLCK);
        ::_exit(0);
    }
    for (;;) {
        ::pause();
    }
}

}  // namespace

LeaseHolder::LeaseHolder(const std::filesystem::path& file,
                         std::optional<std::chrono::milliseconds> delay) {
    std::optional<timespec> time;
    if (delay) {
        time = timespec{delay->count() / 1000, delay->count() % 1000 * 1'000'000};
    }
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) {
        return;
    }
    process_ = ::fork();
    if (process_ == 0) {
        holdLease(file.c_str(), time, ends[1]);
    }
    ::close(ends[1]);
    char held = 'n';
    hasLease_ = ::read(ends[0], &held, 1) == 1 && held == 'y';
    ::close(ends[0]);
}

LeaseHolder::~LeaseHolder() {
    if (process_ > 0) {
        ::kill(process_, SIGKILL);
        ::waitpid(process_, nullptr, 0);
    }
}

}  // namespace test
