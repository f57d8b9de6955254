// SPDX-License-Identifier: Apache-2.0
#include "host/server/child_process.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string_view>
#include <system_error>
#include <utility>

#include "platform/posix/system_error.h"

namespace host {

namespace {

struct Pipe {
    platform::FileDescriptor read;
    platform::FileDescriptor write;
};

Pipe makePipe() {
    int ends[2];
    if (::pipe2(ends, O_CLOEXEC) != 0) {
        platform::throwSystemError("cannot make a pipe");
    }
    return {platform::FileDescriptor(ends[0]), platform::FileDescriptor(ends[1])};
}

// Whether two variables, each as "NAME=value", have the same name.
bool haveSameName(std::string_view one, std::string_view other) {
    return one.substr(0, one.find('=')) == other.substr(0, other.find('='));
}

// The environment for programs: the host's own and `own`, which must outlive the result.
std::vector<char*> makeEnvironment(const std::vector<std::string>& own) {
    std::vector<char*> variables;
    for (const std::string& variable : own) {
        variables.push_back(const_cast<char*>(variable.c_str()));
    }
    for (char** variable = environ; *variable != nullptr; ++variable) {
        const bool isReplaced = std::any_of(own.begin(), own.end(), [&](const std::string& other) {
            return haveSameName(*variable, other);
        });
        if (!isReplaced && !haveSameName(*variable, "GLIBC_TUNABLES")) {
            variables.push_back(*variable);
        }
    }
    variables.push_back(nullptr);
    return variables;
}

// What the new process does before it becomes the program. Other threads of the host may have held
// locks when it was forked off, so it keeps to system calls.
[[noreturn]] void becomeProgram(const char* program, char* const* arguments,
                                char* const* environment, int output, int failure, pid_t host) {
    ::setpgid(0, 0);
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    // The signal is not sent if the host ended before it was requested.
    bool isReady = ::getppid() == host;
    // The program handles the signals that the host blocks or ignores.
    sigset_t none;
    ::sigemptyset(&none);
    ::sigprocmask(SIG_SETMASK, &none, nullptr);
    ::signal(SIGPIPE, SIG_DFL);
    ::signal(SIGXFSZ, SIG_DFL);
    // The host's bound on its own memory would end the program where it makes the host's requests
    // fail. A limit that was set from outside is the hard one.
    rlimit memory{};
    isReady = isReady && ::getrlimit(RLIMIT_DATA, &memory) == 0;
    memory.rlim_cur = memory.rlim_max;
    isReady = isReady && ::setrlimit(RLIMIT_DATA, &memory) == 0;
    // Some libraries open files that the program would inherit.
    isReady = isReady && ::close_range(3, ~0U, CLOSE_RANGE_CLOEXEC) == 0 &&
              ::dup2(output, STDOUT_FILENO) >= 0 && ::dup2(output, STDERR_FILENO) >= 0;
    if (isReady) {
        ::execve(program, arguments, environment);
    }
    const int error = errno;
    // A failure to report the failure cannot be reported either.
    [[maybe_unused]] const ssize_t told = ::write(failure, &error, sizeof error);
    ::_exit(127);
}

}  // namespace

ChildProcess::ChildProcess(const std::filesystem::path& program,
                           const std::vector<std::string>& arguments,
                           const std::vector<std::string>& variables) {
    Pipe output = makePipe();
    Pipe failure = makePipe();
    std::vector<char*> pointers{const_cast<char*>(program.c_str())};
    for (const std::string& argument : arguments) {
        pointers.push_back(const_cast<char*>(argument.c_str()));
    }
    pointers.push_back(nullptr);
    const std::vector<char*> environment = makeEnvironment(variables);
    const pid_t host = ::getpid();
    id_ = ::fork();
    if (id_ == 0) {
        becomeProgram(program.c_str(), pointers.data(), environment.data(), output.write.get(),
                      failure.write.get(), host);
    }
    if (id_ < 0) {
        platform::throwSystemError("cannot start a process");
    }
    failure.write = {};
    int error = 0;
    ssize_t count = 0;
    do {
        count = ::read(failure.read.get(), &error, sizeof error);
    } while (count < 0 && errno == EINTR);
    if (count == sizeof error) {
        collect();
        throw std::system_error(error, std::generic_category(), program.string());
    }
    output_ = std::move(output.read);
}

ChildProcess::~ChildProcess() {
    if (id_ >= 0) {
        send(SIGKILL);
        collect();
    }
}

void ChildProcess::send(int signal) const noexcept {
    if (id_ >= 0) {
        ::kill(id_, signal);
    }
}

std::string ChildProcess::collect() {
    int status = 0;
    while (::waitpid(id_, &status, 0) < 0 && errno == EINTR) {
    }
    id_ = -1;
    return WIFSIGNALED(status) ? "signal " + std::to_string(WTERMSIG(status))
                               : "exit status " + std::to_string(WEXITSTATUS(status));
}

}  // namespace host
