// SPDX-License-Identifier: Apache-2.0
// serialization_host: loads the bundle and gives it a message bus.
#include <spdlog/logger.h>
#include <spdlog/sinks/stdout_color_sinks.h>
#include <spdlog/spdlog.h>

#include <unistd.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <filesystem>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>

#include "host/bus/bundle_location.h"
#include "host/commands/command_line.h"
#include "host/exit_status.h"
#include "host/limits/freed_memory.h"
#include "host/limits/limiting_sink.h"
#include "host/limits/memory_limit.h"
#include "host/standard_streams.h"
#include "platform/posix/file_descriptor.h"

namespace {

// The lines of each logger and level in that time: more than a person reads, and few enough that
// endless wrong messages cannot fill the disk.
constexpr std::size_t mostLogLines = 100;
constexpr std::chrono::seconds logPeriod{10};

void setUpLogging(const std::string& level) {
    const auto sink = std::make_shared<host::LimitingSink>(
        std::make_shared<spdlog::sinks::stderr_color_sink_mt>(), mostLogLines, logPeriod);
    spdlog::set_default_logger(std::make_shared<spdlog::logger>(host::programName, sink));
    // The one that the messaging library takes.
    spdlog::register_logger(std::make_shared<spdlog::logger>("messaging", sink));
    spdlog::set_pattern("%^%n: %l:%$ %v");
    spdlog::set_level(spdlog::level::from_str(level));
}

int run(const CLI::App& app, host::CommandLine& line, int output) {
    const std::filesystem::path bundle = line.bundle.empty() ? host::findBundle() : line.bundle;
    if (app.got_subcommand("read")) {
        line.read.bundle = bundle;
        return host::runRead(line.read, STDIN_FILENO, output);
    }
    if (app.got_subcommand("history")) {
        line.history.bundle = bundle;
        return host::runHistory(line.history, output);
    }
    if (app.got_subcommand("serve")) {
        line.serve.bundle = bundle;
        return host::runServe(line.serve, output);
    }
    if (app.got_subcommand("write")) {
        line.write.bundle = bundle;
        return host::runWrite(line.write, STDIN_FILENO, output);
    }
    line.stdio.bundle = bundle;
    return host::runStdio(line.stdio, STDIN_FILENO, output);
}

// Prints what ended the parse early: help and version to `output`, an error to standard error.
int explain(const CLI::App& app, const CLI::ParseError& error, int output) {
    std::ostringstream help;
    std::ostringstream ignored;
    if (app.exit(error, help, ignored) != 0) {
        std::cerr << host::complaint(app, error);
        return host::exitWrongUsage;
    }
    host::writeAll(output, {help.str()});
    return host::exitDone;
}

int runCommandLine(int argc, char** argv, int output) {
    CLI::App app;
    host::CommandLine line;
    line.memoryLimit = LIMIT_MEMORY ? host::defaultMemoryLimit() : 0;
    host::describe(app, line);
    try {
        host::parse(app, {argv + 1, argv + argc});
    } catch (const CLI::ParseError& error) {
        return explain(app, error, output);
    }
    setUpLogging(line.logLevel);
    host::keepFreedMemory();
    const std::uint64_t memory = host::memoryForRequests(
        line.memoryLimit != 0 ? host::limitMemory(line.memoryLimit) : host::defaultMemoryLimit());
    line.serve.memoryForRequests = memory;
    line.stdio.memoryForRequests = memory;
    const int status = run(app, line, output);
    spdlog::default_logger()->flush();  // It may still have to say how many lines it left out.
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    // A reader that goes away must be an error of the write, not the end of the process.
    std::signal(SIGPIPE, SIG_IGN);
    // The same for a file that grows past the process's limit.
    std::signal(SIGXFSZ, SIG_IGN);
    try {
        host::openMissingStandardStreams();
        const platform::FileDescriptor output = host::divertStandardOutput();
        return runCommandLine(argc, argv, output.get());
    } catch (const host::ReaderGone&) {
        return host::exitRequestFailed;  // not told to a reader that has seen enough, such as head
    } catch (const std::exception& error) {
        std::cerr << host::programName << ": " << host::asLine(error.what()) << '\n';
        return host::exitRequestFailed;
    }
}
