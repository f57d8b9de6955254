// SPDX-License-Identifier: Apache-2.0
#include "tests/host/subprocess.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "host/commands/standard_streams.h"

namespace test {

namespace {

void check(int error, const char* what) {
    if (error != 0) {
        throw std::system_error(error, std::generic_category(), what);
    }
}

std::pair<platform::FileDescriptor, platform::FileDescriptor> makePipe() {
    int ends[2];
    check(::pipe2(ends, O_CLOEXEC) == 0 ? 0 : errno, "pipe2");
    return {platform::FileDescriptor(ends[0]), platform::FileDescriptor(ends[1])};
}

std::string readChunk(const platform::FileDescriptor& from) {
    std::string chunk(64 * 1024, '\0');
    chunk.resize(host::readSome(from.get(), chunk.data(), chunk.size()));
    return chunk;
}

std::string readToEnd(const platform::FileDescriptor& from) {
    std::string all;
    if (from.get() >= 0) {
        for (std::string chunk = readChunk(from); !chunk.empty(); chunk = readChunk(from)) {
            all += chunk;
        }
    }
    return all;
}

// Starts `command` with the given descriptors as its standard streams.
pid_t spawn(const std::vector<std::string>& command, int input, int output, int errors) {
    posix_spawn_file_actions_t actions;
    posix_spawnattr_t attributes;
    check(::posix_spawn_file_actions_init(&actions), "posix_spawn_file_actions_init");
    check(::posix_spawnattr_init(&attributes), "posix_spawnattr_init");
    ::posix_spawn_file_actions_adddup2(&actions, input, STDIN_FILENO);
    ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
    ::posix_spawn_file_actions_adddup2(&actions, errors, STDERR_FILENO);
    // The program shall meet a broken pipe as it would when started by a shell.
    sigset_t pipeSignal;
    ::sigemptyset(&pipeSignal);
    ::sigaddset(&pipeSignal, SIGPIPE);
    ::posix_spawnattr_setsigdefault(&attributes, &pipeSignal);
    ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);

    std::vector<char*> arguments;
    for (const std::string& argument : command) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    pid_t id = -1;
    const int error =
        ::posix_spawn(&id, arguments[0], &actions, &attributes, arguments.data(), environ);
    ::posix_spawnattr_destroy(&attributes);
    ::posix_spawn_file_actions_destroy(&actions);
    check(error, arguments[0]);
    return id;
}

int collect(pid_t id) {
    int status = 0;
    while (::waitpid(id, &status, 0) < 0) {
        check(errno == EINTR ? 0 : errno, "waitpid");
    }
    return WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
}

}  // namespace

Subprocess::Subprocess(const std::vector<std::string>& command) {
    // A program that ends early shall be an error of the write, not the end of the tests.
    ::signal(SIGPIPE, SIG_IGN);
    auto [inputRead, inputWrite] = makePipe();
    auto [outputRead, outputWrite] = makePipe();
    auto [errorsRead, errorsWrite] = makePipe();
    id_ = spawn(command, inputRead.get(), outputWrite.get(), errorsWrite.get());
    input_ = std::move(inputWrite);
    output_ = std::move(outputRead);
    // Read all the while, so that a program with much to say does not wait for it to be heard.
    errors_ =
        std::async(std::launch::async, [from = std::move(errorsRead)] { return readToEnd(from); });
}

Subprocess::~Subprocess() {
    if (id_ >= 0) {
        ::kill(id_, SIGKILL);
        collect(id_);
    }
}

void Subprocess::write(std::string_view input) {
    host::writeAll(input_.get(), {input});
}

std::string Subprocess::readSome() {
    return readChunk(output_);
}

Outcome Subprocess::waitForEnd() {
    Outcome outcome;
    outcome.output = readToEnd(output_);
    outcome.errors = errors_.get();
    outcome.status = collect(std::exchange(id_, -1));
    return outcome;
}

Outcome Subprocess::finish() {
    closeInput();
    return waitForEnd();
}

Outcome run(const std::vector<std::string>& command, std::string_view input) {
    Subprocess program(command);
    std::future<void> written = std::async(std::launch::async, [&] {
        try {
            program.write(input);
        } catch (const std::system_error&) {
            // The program may end before it has read all of its input.
        }
        program.closeInput();
    });
    std::string output;
    for (std::string chunk = program.readSome(); !chunk.empty(); chunk = program.readSome()) {
        output += chunk;
    }
    written.get();
    Outcome outcome = program.finish();
    outcome.output = std::move(output);
    return outcome;
}

}  // namespace test
