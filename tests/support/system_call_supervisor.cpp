// SPDX-License-Identifier: Apache-2.0
// The kernel's seccomp filters can hand system calls of a thread to a supervisor, who answers for
// them or lets them continue. The filter here concerns only the thread that installs it.
#include "tests/support/system_call_supervisor.h"

#include <linux/filter.h>
#include <linux/seccomp.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <future>
#include <stdexcept>
#include <thread>

namespace test {
namespace {

// What allocators, locks and the end of a thread need. Failing those is not about files.
constexpr std::array leftAlone = {SYS_mmap,          SYS_munmap,
                                  SYS_mremap,        SYS_mprotect,
                                  SYS_madvise,       SYS_brk,
                                  SYS_futex,         SYS_rt_sigprocmask,
                                  SYS_sched_yield,   SYS_exit,
                                  SYS_exit_group,    SYS_gettid,
                                  SYS_getpid,        SYS_rt_sigreturn,
                                  SYS_clock_gettime, SYS_set_robust_list,
                                  SYS_sigaltstack,   SYS_sched_getaffinity};

// Installs the filter in the calling thread. Returns the descriptor on which its calls are
// announced.
int installFilter() {
    std::vector<sock_filter> filter = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr))};
    for (const auto call : leftAlone) {
        filter.push_back(BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<unsigned>(call), 0, 1));
        filter.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
    }
    filter.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_USER_NOTIF));
    const sock_fprog program{static_cast<unsigned short>(filter.size()), filter.data()};
    if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) {
        return -1;
    }
    return static_cast<int>(::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER,
                                      SECCOMP_FILTER_FLAG_NEW_LISTENER, &program));
}

// Waits for the next call. Returns false when the thread has ended.
bool receive(int listener, seccomp_notif& call) {
    for (;;) {
        pollfd events{listener, POLLIN, 0};
        if (::poll(&events, 1, -1) > 0 && (events.revents & POLLIN) == 0) {
            return false;
        }
        call = {};
        if (::ioctl(listener, SECCOMP_IOCTL_NOTIF_RECV, &call) == 0) {
            return true;
        }
    }
}

void answer(int listener, const seccomp_notif& call, int error) {
    seccomp_notif_resp response{};
    response.id = call.id;
    response.error = -error;
    response.flags = error == 0 ? SECCOMP_USER_NOTIF_FLAG_CONTINUE : 0;
    ::ioctl(listener, SECCOMP_IOCTL_NOTIF_SEND, &response);
}

}  // namespace

void supervise(const std::function<void()>& work, const std::function<int(int, int)>& decide) {
    std::promise<int> listenerPromise;
    std::thread thread([&] {
        const int listener = installFilter();
        listenerPromise.set_value(listener);
        if (listener >= 0) {
            work();
        }
    });
    const int listener = listenerPromise.get_future().get();
    seccomp_notif call{};
    for (int index = 0; listener >= 0 && receive(listener, call); ++index) {
        answer(listener, call, decide(call.data.nr, index));
    }
    thread.join();
    if (listener < 0) {
        throw std::runtime_error("system calls cannot be supervised");
    }
    ::close(listener);
}

bool canSupervise() {
    try {
        const std::vector<int> calls = callsOf([] { ::syscall(SYS_getppid); });
        return std::find(calls.begin(), calls.end(), SYS_getppid) != calls.end();
    } catch (const std::runtime_error&) {
        return false;
    }
}

std::vector<int> callsOf(const std::function<void()>& work) {
    std::vector<int> calls;
    supervise(work, [&](int call, int) {
        calls.push_back(call);
        return 0;
    });
    return calls;
}

}  // namespace test
