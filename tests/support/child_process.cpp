// SPDX-License-Identifier: Apache-2.0
#include "tests/support/child_process.h"

#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

namespace test {

ChildProcess::ChildProcess(std::vector<std::string> command) {
    std::vector<char*> arguments;
    for (std::string& argument : command) {
        arguments.push_back(argument.data());
    }
    arguments.push_back(nullptr);
    const std::string elsewhere = "/usr/sbin/" + command.front();
    const pid_t parent = ::getpid();
    id_ = ::fork();
    if (id_ < 0) {
        throw std::system_error(errno, std::generic_category(), "no process can be started");
    }
    if (id_ == 0) {
        // Only what is safe after a fork of a program with threads.
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (::getppid() != parent) {
            ::_exit(1);
        }
        ::execvp(arguments.front(), arguments.data());
        ::execv(elsewhere.c_str(), arguments.data());
        ::_exit(127);
    }
}

ChildProcess::ChildProcess(ChildProcess&& other) noexcept : id_(std::exchange(other.id_, -1)) {}

ChildProcess& ChildProcess::operator=(ChildProcess&& other) noexcept {
    std::swap(id_, other.id_);
    return *this;
}

ChildProcess::~ChildProcess() {
    kill();
}

void ChildProcess::kill() {
    if (id_ > 0) {
        ::kill(id_, SIGKILL);
        wait();
    }
}

void ChildProcess::signal(int number) const {
    if (id_ > 0) {
        ::kill(id_, number);
    }
}

int ChildProcess::wait() {
    int status = 0;
    if (id_ <= 0 || ::waitpid(std::exchange(id_, -1), &status, 0) < 0) {
        return -1;
    }
    return WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
}

bool ChildProcess::hasEnded() {
    if (id_ > 0 && ::waitpid(id_, nullptr, WNOHANG) == id_) {
        id_ = -1;
    }
    return id_ <= 0;
}

}  // namespace test
