// SPDX-License-Identifier: Apache-2.0
#include "tests/support/subprocess.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <system_error>
#include <utility>

#include "host/standard_streams.h"
#include "platform/posix/system_error.h"

namespace test {

namespace {

std::pair<platform::FileDescriptor, platform::FileDescriptor> makePipe() {
    int ends[2];
    if (::pipe2(ends, O_CLOEXEC) != 0) {
        platform::throwSystemError("no pipe can be made");
    }
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

}  // namespace

Subprocess::Subprocess(const std::vector<std::string>& command) {
    // A program that ends early must be an error of the write, not the end of the tests.
    ::signal(SIGPIPE, SIG_IGN);
    auto [inputRead, inputWrite] = makePipe();
    auto [outputRead, outputWrite] = makePipe();
    auto [errorsRead, errorsWrite] = makePipe();
    process_.emplace(command,
                     StandardStreams{inputRead.get(), outputWrite.get(), errorsWrite.get()});
    input_ = std::move(inputWrite);
    output_ = std::move(outputRead);
    // Read all the while, so that a program that writes much does not block.
    errors_ =
        std::async(std::launch::async, [from = std::move(errorsRead)] { return readToEnd(from); });
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
    outcome.status = process_->wait();
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
