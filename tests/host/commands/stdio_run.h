// SPDX-License-Identifier: Apache-2.0
// The command `stdio`, run within the test's process on one read request and one write request, so
// that faults can be injected.
#pragma once

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spdlog/spdlog.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <exception>
#include <filesystem>
#include <functional>
#include <iterator>
#include <optional>
#include <ostream>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/commands/framing.h"
#include "host/commands/stdio_command.h"
#include "host/exit_status.h"
#include "host/standard_streams.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/system_error.h"
#include "tests/support/message.h"
#include "tests/support/process_state.h"
#include "tests/support/temporary_directory.h"

namespace test {

class StdioRun : public testing::Test {
protected:
    /// How a run of the command ended.
    struct Outcome {
        int status = 0;
        std::string output;
    };

    /// Calls the function that it is given, which runs the command and does not throw.
    using Around = std::function<void(const std::function<void()>& command)>;

    StdioRun() {
        spdlog::set_level(spdlog::level::off);  // the failures are meant
        writeFile(folder_ / "old", "text");
        input_ = request("read", "old", "") + request("write", "new", R"("content":"new",)");
        answers_ = framesIn(run().output);
    }

    ~StdioRun() override { spdlog::set_level(spdlog::level::info); }

    std::string request(const std::string& kind, const std::string& file,
                        const std::string& content) const {
        const std::string payload = R"({"rtcId":"1","contentType":"","encoding":"UTF-8",)" +
                                    content + R"("filePath":")" + (folder_ / file).string() + "\"}";
        return host::frameHeaders("/zpr/service/" + kind + "Request_cpp", payload.size()) + payload;
    }

    /// Runs the command within `around`.
    Outcome run(const Around& around = [](const auto& command) { command(); }) const {
        std::filesystem::remove(folder_ / "new");
        auto [input, inputEnd] = makePipe();
        auto [output, outputEnd] = makePipe();
        // What comes in and what goes out fit into the pipes.
        host::writeAll(inputEnd.get(), {input_});
        inputEnd = platform::FileDescriptor(-1);
        Outcome outcome;
        around([&, in = input.get(), out = outputEnd.get()] {
            try {
                outcome.status = host::runStdio({.bundle = SERIALIZATION_BUNDLE}, in, out);
            } catch (const std::exception&) {
                outcome.status = host::exitRequestFailed;
            }
        });
        { const platform::FileDescriptor closed = std::move(outputEnd); }
        std::array<char, 4096> piece{};
        while (const std::size_t count = host::readSome(output.get(), piece.data(), piece.size())) {
            outcome.output.append(piece.data(), count);
        }
        return outcome;
    }

    /// The frames of `output` that are whole.
    static std::vector<Message> framesIn(std::string_view output) {
        std::vector<Message> messages;
        const std::size_t size = output.size();
        host::FrameReader reader(
            [&output](char* to, std::size_t room) {
                const std::size_t count = output.copy(to, room);
                output.remove_prefix(count);
                return count;
            },
            size);
        try {
            while (std::optional<host::Frame> frame = reader.next()) {
                messages.push_back({std::move(frame->channel), std::string(frame->payload.view())});
            }
        } catch (const host::FramingError&) {
            // The last one is cut off.
        }
        return messages;
    }

    static std::size_t sizeOf(const std::vector<Message>& frames) {
        std::size_t size = 0;
        for (const auto& [channel, payload] : frames) {
            size += host::frameHeaders(channel, payload.size()).size() + payload.size();
        }
        return size;
    }

    void expectAllAnswers(const Outcome& outcome) const {
        EXPECT_EQ(outcome.status, host::exitDone);
        EXPECT_EQ(answers_.size(), 3U);
        EXPECT_THAT(framesIn(outcome.output), testing::UnorderedElementsAreArray(answers_));
    }

    /// That the command has done its work or says that it has not, and that each frame is an answer
    /// to one of the requests, of which the write is announced before its answer.
    void expectOrderlyEnd(const Outcome& outcome) const {
        const std::vector<Message> frames = framesIn(outcome.output);
        EXPECT_THAT(outcome.status, testing::AnyOf(host::exitDone, host::exitRequestFailed));
        if (outcome.status == host::exitDone) {
            EXPECT_EQ(sizeOf(frames), outcome.output.size());
        }
        std::set<std::string> channels;
        for (const auto& [channel, payload] : frames) {
            EXPECT_TRUE(channels.insert(channel).second) << "two frames on " << channel;
            if (channel == "/zpr/service/readResponse/1") {
                EXPECT_THAT(payload,
                            testing::AnyOf(
                                R"({"data":"text","status":true})",
                                R"({"data":"","status":true})",  // it could not be opened
                                testing::MatchesRegex(R"(\{"exception":".+","status":false\})")));
            } else if (channel == "/zpr/service/writeResponse/1") {
                EXPECT_THAT(payload, testing::AnyOf("true", "false"));
            } else {
                EXPECT_THAT(answers_, testing::Contains(Message{channel, payload}));
                EXPECT_FALSE(channels.contains("/zpr/service/writeResponse/1"));
            }
        }
        EXPECT_EQ(readFile(folder_ / "old"), "text");
    }

    const std::vector<Message>& answers() const { return answers_; }

    TemporaryDirectory folder_;

private:
    static std::pair<platform::FileDescriptor, platform::FileDescriptor> makePipe() {
        std::array<int, 2> ends{};
        if (::pipe2(ends.data(), O_CLOEXEC) != 0) {
            platform::throwSystemError("no pipe");
        }
        return {platform::FileDescriptor(ends[0]), platform::FileDescriptor(ends[1])};
    }

    std::string input_;
    std::vector<Message> answers_;  // when nothing fails
};

}  // namespace test
