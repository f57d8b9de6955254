// SPDX-License-Identifier: Apache-2.0
#include "host/commands/stdio_command.h"

#include <poll.h>
#include <spdlog/spdlog.h>
#include <sys/eventfd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <exception>
#include <future>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>

#include "host/bus/bundle_host.h"
#include "host/commands/exit_status.h"
#include "host/commands/framing.h"
#include "host/commands/standard_streams.h"
#include "host/commands/stop_signals.h"
#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

// Writes messages as frames, one after the other whoever brings them, until a write fails.
class FrameOutput {
public:
    explicit FrameOutput(int output) : output_(output), broken_(::eventfd(0, EFD_CLOEXEC)) {
        if (broken_.get() < 0) {
            throw std::system_error(errno, std::generic_category(), "cannot make an eventfd");
        }
    }

    // Any thread may call it. A message that no frame can carry is left out; what comes after a
    // failed write is too, for its reader could not tell where it begins.
    void write(const JsonMessage& message) {
        std::string headers;
        try {
            headers = frameHeaders(message.channel(), message.payload().size());
        } catch (const std::invalid_argument& error) {
            spdlog::error("a message is left out: {}", error.what());
            return;
        }
        const std::lock_guard lock(mutex_);
        if (isBroken_) {
            return;
        }
        try {
            writeAll(output_, {headers, message.payload()});
        } catch (const std::system_error& error) {
            spdlog::error("{}", error.what());
            isBroken_ = true;
            ::eventfd_write(broken_.get(), 1);
        }
    }

    bool isBroken() const { return isBroken_; }

    // Blocks until `input` has bytes or has ended; returns false when the output broke instead, or
    // `stop` became readable.
    bool waitForInput(int input, int stop) const {
        std::array<pollfd, 3> waited{
            {{input, POLLIN, 0}, {broken_.get(), POLLIN, 0}, {stop, POLLIN, 0}}};
        while (::poll(waited.data(), waited.size(), -1) < 0) {
            if (errno != EINTR) {
                throw std::system_error(errno, std::generic_category(), "cannot wait for input");
            }
        }
        return !isBroken_ && waited[2].revents == 0;
    }

private:
    int output_;
    platform::FileDescriptor broken_;  // Becomes readable when a write has failed.
    std::atomic<bool> isBroken_ = false;
    std::mutex mutex_;  // Held while a frame is written.
};

// Sends on the messages of `input` until it ends. Returns the exit status that it leads to.
int takeMessages(FrameReader& input, BundleHost& host, const std::shared_future<void>& stop) {
    try {
        while (std::optional<Frame> frame = input.next()) {
            host.publish(frame->channel, std::move(frame->payload));
        }
        return exitDone;
    } catch (const FramingError& error) {
        if (stop.wait_for(std::chrono::seconds(0)) == std::future_status::ready) {
            return exitDone;  // The rest of a frame was not waited for.
        }
        spdlog::error("{}", error.what());
        return exitWrongUsage;
    } catch (const std::exception& error) {
        spdlog::error("{}", error.what());
        return exitRequestFailed;
    }
}

}  // namespace

int runStdio(const StdioOptions& options, int input, int output) {
    // Who is asked to end takes no more requests, but does not leave those half done that it took.
    blockStopSignals();
    FrameOutput frames(output);
    const Guard guard = makeGuard(options.guard, {});
    BundleHost host(
        options.bundle, options.largestMessage,
        [&frames](const JsonMessage& message) { frames.write(message); }, guard,
        options.memoryForRequests);
    const StopSignals signals([] {});
    FrameReader reader(
        [&](char* to, std::size_t room) {
            return frames.waitForInput(input, signals.descriptor()) ? readSome(input, to, room) : 0;
        },
        options.largestMessage);
    const int status = takeMessages(reader, host, signals.first());
    host.waitUntilIdle();
    return frames.isBroken() ? exitRequestFailed : status;
}

}  // namespace host
