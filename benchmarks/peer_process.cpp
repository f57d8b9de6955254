// SPDX-License-Identifier: Apache-2.0
#include "benchmarks/peer_process.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstdlib>
#include <stdexcept>

namespace benchmarks {

PeerProcess::PeerProcess(const std::vector<std::string>& arguments) : name_(arguments.front()) {
    std::array<int, 2> commands{};
    std::array<int, 2> answers{};
    if (::pipe2(commands.data(), O_CLOEXEC) != 0 || ::pipe2(answers.data(), O_CLOEXEC) != 0) {
        throw std::runtime_error("no pipes for " + name_);
    }
    std::signal(SIGPIPE, SIG_IGN);
    std::vector<char*> words;
    for (const std::string& argument : arguments) {
        words.push_back(const_cast<char*>(argument.c_str()));
    }
    words.push_back(nullptr);
    process_ = ::fork();
    if (process_ == 0) {
        ::dup2(commands[0], STDIN_FILENO);
        ::dup2(answers[1], STDOUT_FILENO);
        ::execvp(words.front(), words.data());
        ::_exit(127);
    }
    ::close(commands[0]);
    ::close(answers[1]);
    commands_.reset(::fdopen(commands[1], "w"));
    answers_.reset(::fdopen(answers[0], "r"));
}

PeerProcess::~PeerProcess() {
    commands_.reset();
    ::waitpid(process_, nullptr, 0);
}

double PeerProcess::run(const std::vector<std::string>& words) {
    std::string command;
    for (const std::string& word : words) {
        command += command.empty() ? word : "\t" + word;
    }
    command += '\n';
    std::array<char, 1024> answer{};
    if (std::fputs(command.c_str(), commands_.get()) < 0 || std::fflush(commands_.get()) != 0 ||
        std::fgets(answer.data(), static_cast<int>(answer.size()), answers_.get()) == nullptr) {
        throw std::runtime_error(name_ + " does not run");
    }
    char* end = nullptr;
    const double nanoseconds = std::strtod(answer.data(), &end);
    if (end == answer.data()) {
        throw std::runtime_error(name_ + ": " + answer.data());
    }
    return nanoseconds * 1e-9;
}

}  // namespace benchmarks
