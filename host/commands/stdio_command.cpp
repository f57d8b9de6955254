// SPDX-License-Identifier: Apache-2.0
#include "host/commands/stdio_command.h"

#include <poll.h>
#include <spdlog/spdlog.h>

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
#include "host/commands/framing.h"
#include "host/commands/stop_signals.h"
#include "host/exit_status.h"
#include "host/standard_streams.h"
#include "platform/posix/event.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

// Writes messages as frames, one at a time, until a write fails.
class FrameOutput {
public:
    explicit FrameOutput(int output) : output_(output) {}

    // Any thread may call it. A message that no frame can carry is left out. So are all messages
    // after a failed write: a reader could not tell where they begin.
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
            broken_.set();
        }
    }

    bool isBroken() const { return isBroken_; }

    // Blocks until `input` has bytes or has ended; returns false when the output broke instead, or
    // `stop` became readable.
    bool waitForInput(int input, int stop) const {
        std::array<pollfd, 3> waited{
            {{input, POLLIN, 0}, {broken_.descriptor(), POLLIN, 0}, {stop, POLLIN, 0}}};
        while (::poll(waited.data(), waited.size(), -1) < 0) {
            if (errno != EINTR) {
                platform::throwSystemError("cannot wait for input");
            }
        }
        return !isBroken_ && waited[2].revents == 0;
    }

private:
    int output_;
    platform::Event broken_;  // A write has failed.
    std::atomic<bool> isBroken_ = false;
    std::mutex mutex_;  // Held while a frame is written.
};

// Sends the messages of `input` to the bundle until it ends. Returns the exit status.
int takeMessages(FrameReader& input, BundleHost& host, const std::shared_future<void>& stop) {
    try {
        while (std::optional<Frame> frame = input.next()) {
            host.publish(frame->channel, std::move(frame->payload));
        }
        return exitDone;
    } catch (const FramingError& error) {
        if (stop.wait_for(std::chrono::seconds(0)) == std::future_status::ready) {
            return exitDone;  // The signal cut a frame short.
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
    // On a signal, the command takes no more requests but finishes those that it has taken.
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
