// SPDX-License-Identifier: Apache-2.0
#include "tests/support/child_process.h"

#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <utility>

#include "platform/posix/system_error.h"

namespace test {

namespace {

void replace(int stream, int descriptor) {
    if (descriptor >= 0 && ::dup2(descriptor, stream) < 0) {
        ::_exit(126);
    }
}

}  // namespace

ChildProcess::ChildProcess(std::vector<std::string> command, const StandardStreams& streams) {
    std::vector<char*> arguments;
    for (std::string& argument : command) {
        arguments.push_back(argument.data());
    }
    arguments.push_back(nullptr);
    const std::string elsewhere = "/usr/sbin/" + command.front();
    const pid_t parent = ::getpid();
    id_ = ::fork();
    if (id_ < 0) {
        platform::throwSystemError("no process can be started");
    }
    if (id_ == 0) {
        // Only what is safe after a fork of a program with threads.
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (::getppid() != parent) {
            ::_exit(1);
        }
        // As a shell would start it, whatever this process does with signals.
        ::signal(SIGPIPE, SIG_DFL);
        replace(STDIN_FILENO, streams.input);
        replace(STDOUT_FILENO, streams.output);
        replace(STDERR_FILENO, streams.errors);
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
    if (id_ <= 0) {
        return -1;
    }
    while (::waitpid(id_, &status, 0) < 0) {
        if (errno != EINTR) {
            platform::throwSystemError("a process cannot be waited for");
        }
    }
    id_ = -1;
    return WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
}

bool ChildProcess::hasEnded() {
    if (id_ > 0 && ::waitpid(id_, nullptr, WNOHANG) == id_) {
        id_ = -1;
    }
    return id_ <= 0;
}

}  // namespace test
