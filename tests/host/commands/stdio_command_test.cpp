// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>

#include <algorithm>
#include <cstddef>
#include <fstream>
#include <future>
#include <optional>
#include <random>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "platform/messaging/channels.h"
#include "tests/host/host_program.h"
#include "tests/support/names_in.h"
#include "tests/support/process_state.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::messaging::notificationChannel;
using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using platform::messaging::writeRequestChannel;
using platform::messaging::writeResponsePrefix;
using test::framed;
using test::framedReadRequest;
using test::hostCommand;
using test::Message;
using test::messagesIn;
using test::Outcome;
using test::writeFile;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAre;

Message success(const std::string& rtcId, const std::string& data) {
    return {readResponsePrefix + rtcId, "{\"data\":\"" + data + "\",\"status\":true}"};
}

class StdioCommand : public ::testing::Test {
protected:
    StdioCommand() { writeFile(file_, "text"); }

    // Runs the command with `input` and expects success.
    std::vector<Message> answersTo(const std::string& input) {
        const Outcome outcome = test::run(command_, input);
        EXPECT_EQ(outcome.status, 0) << outcome.errors;
        return messagesIn(outcome.output);
    }

    const std::vector<std::string> command_ = hostCommand({"stdio"});
    test::TemporaryDirectory folder_;
    const std::string file_ = folder_ / "file";
};

TEST_F(StdioCommand, EndsWhereItsInputDoes) {
    const Outcome outcome = test::run(command_);
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, IsEmpty());
}

TEST_F(StdioCommand, AnswersEachRequestOnItsOwnChannel) {
    EXPECT_THAT(
        answersTo(framedReadRequest("7", file_) + framedReadRequest("a/b", file_) +
                  framedReadRequest("", file_)),
        UnorderedElementsAre(success("7", "text"), success("a/b", "text"), success("", "text")));
}

TEST_F(StdioCommand, AnswersWhileItsInputGoesOn) {
    test::Subprocess program(command_);
    for (const std::string rtcId : {"1", "2", "3"}) {
        program.write(framedReadRequest(rtcId, file_));
        const Message expected = success(rtcId, "text");
        const std::size_t size = framed(expected.channel, expected.payload).size();
        std::string answer;
        while (answer.size() < size) {
            answer += program.readSome();
        }
        EXPECT_THAT(messagesIn(answer), ElementsAre(expected));
    }
    EXPECT_EQ(program.finish().status, 0);
}

TEST_F(StdioCommand, GivesRequestsThatAreNoneNoAnswerAndGoesOn) {
    const std::string good = framedReadRequest("good", file_);
    for (const std::string& request :
         {std::string(), std::string("no JSON"), std::string("[]"), std::string("{}"),
          std::string(100'000, '['),
          "{\"contentType\":\"text/plain\",\"filePath\":\"" + file_ + "\"}",
          "{\"rtcId\":1,\"contentType\":\"text/plain\",\"filePath\":\"" + file_ + "\"}",
          std::string("{\"rtcId\":\"1\",\"contentType\":\"\",\"filePath\":\"caf\xE9\"}")}) {
        EXPECT_THAT(answersTo(framed(readRequestChannel, request) + good),
                    ElementsAre(success("good", "text")))
            << request.substr(0, 100);
    }
}

TEST_F(StdioCommand, LeavesOutMessagesThatNobodyTakes) {
    EXPECT_THAT(answersTo(framed("/nobody", "x") + framed("/zpr/service/readResponse/1", "x") +
                          framedReadRequest("1", file_)),
                ElementsAre(success("1", "text")));
}

TEST_F(StdioCommand, WritesOutAllThatTheBundlePublishes) {
    const std::string newFile = folder_ / "new";
    const std::string request = "{\"rtcId\":\"7\",\"contentType\":\"text/plain\",\"filePath\":\"" +
                                newFile + "\",\"content\":\"\xC3\xA9\",\"encoding\":\"UTF-8\"}";
    EXPECT_THAT(answersTo(framed(writeRequestChannel, request)),
                ElementsAre(Message{"/zpr/service/notifyFileSystemRequest",
                                    "{\"filePath\":\"" + newFile + "\",\"isExistingFile\":false}"},
                            Message{"/zpr/service/writeResponse/7", "true"}));
    EXPECT_EQ(test::readFile(newFile), "\xC3\xA9");
}

TEST_F(StdioCommand, FinishesWhatItTookBeforeBadFraming) {
    const Outcome outcome = test::run(command_, framedReadRequest("1", file_) + "bad\r\n\r\n");
    EXPECT_EQ(outcome.status, 2);
    EXPECT_THAT(messagesIn(outcome.output), ElementsAre(success("1", "text")));
    EXPECT_THAT(outcome.errors, HasSubstr("message 2 of the input is not framed rightly"));
}

TEST_F(StdioCommand, TakesAnInputThatEndsInAFrameForBadFraming) {
    const std::string request = framedReadRequest("1", file_);
    for (const std::size_t length : {std::size_t{1}, request.size() / 2, request.size() - 1}) {
        const Outcome outcome = test::run(command_, request.substr(0, length));
        EXPECT_EQ(outcome.status, 2);
        EXPECT_THAT(outcome.output, IsEmpty());
        EXPECT_THAT(outcome.errors, HasSubstr("the input ends"));
    }
}

TEST_F(StdioCommand, RefusesAMessageAboveItsLimit) {
    const std::string request = framedReadRequest("1", file_);
    const Outcome outcome = test::run(hostCommand({"stdio", "--max-message", "10"}), request);
    EXPECT_EQ(outcome.status, 2);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, HasSubstr("above the limit of 10 bytes"));
    EXPECT_EQ(test::run(hostCommand({"stdio", "--max-message", "1MB"}), request).status, 0);
}

TEST_F(StdioCommand, LeavesOutAMessageWhoseChannelWouldBreakTheFraming) {
    const std::string hostile =
        "{\"rtcId\":\"a\\r\\nContent-Length: 0\\r\\n\\r\\n\","
        "\"contentType\":\"text/plain\",\"filePath\":\"" +
        file_ + "\"}";
    const Outcome outcome =
        test::run(command_, framed(readRequestChannel, hostile) + framedReadRequest("good", file_));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(messagesIn(outcome.output), ElementsAre(success("good", "text")));
    EXPECT_THAT(outcome.errors, HasSubstr("a message is left out"));
}

TEST_F(StdioCommand, DoesNotFillTheLogWithWhatItDoesNotUnderstand) {
    std::string input;
    for (int i = 0; i < 1000; ++i) {
        input += framed(readRequestChannel, "no request");
    }
    const Outcome outcome = test::run(command_, input + framedReadRequest("good", file_));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(messagesIn(outcome.output), ElementsAre(success("good", "text")));
    // Each is logged or counted.
    std::size_t logged = 0;
    std::size_t leftOut = 0;
    std::istringstream lines(outcome.errors);
    for (std::string line; std::getline(lines, line);) {
        constexpr std::string_view count =
            "messaging: error: lines like these that were left out: ";
        if (line.starts_with(count)) {
            leftOut += std::stoul(line.substr(count.size()));
        } else {
            EXPECT_THAT(line, HasSubstr("The handler of channel"));
            ++logged;
        }
    }
    EXPECT_EQ(logged + leftOut, 1000U);
    EXPECT_GE(logged, 100U);
    EXPECT_GT(leftOut, 0U);
}

TEST_F(StdioCommand, CarriesLargeMessagesBothWays) {
    const std::string text(50'000'000, 'x');
    writeFile(file_, text);
    const std::string request = "{\"rtcId\":\"1\",\"contentType\":\"text/plain\",\"filePath\":\"" +
                                file_ + "\",\"other\":\"" + text + "\"}";
    const std::vector<Message> answers = answersTo(framed(readRequestChannel, request));
    ASSERT_THAT(answers, SizeIs(1));
    EXPECT_TRUE(answers[0] == success("1", text));
}

TEST_F(StdioCommand, LosesNoneOfManyRequests) {
    constexpr std::size_t count = 20'000;
    std::string input;
    std::vector<std::string> expected;
    for (std::size_t i = 0; i < count; ++i) {
        input += framedReadRequest(std::to_string(i), file_);
        expected.push_back(readResponsePrefix + std::to_string(i));
    }
    std::vector<std::string> channels;
    for (const Message& answer : answersTo(input)) {
        channels.push_back(answer.channel);
    }
    std::sort(channels.begin(), channels.end());
    std::sort(expected.begin(), expected.end());
    EXPECT_TRUE(channels == expected);
}

// The bundle takes longer for each than it takes to come in, and not all fit on the bus at a time.
TEST_F(StdioCommand, LosesNoneOfManyLargeMessages) {
    const std::string text(9'000'000, 'x');
    std::string input;
    std::vector<Message> expected;
    for (const std::string name : {"0", "1", "2", "3", "4", "5", "6", "7", "8", "9"}) {
        const std::string file = folder_ / name;
        input += framed(writeRequestChannel,
                        "{\"rtcId\":\"" + name + "\",\"contentType\":\"\",\"filePath\":\"" + file +
                            "\",\"content\":\"" + text + "\",\"encoding\":\"UTF-8\"}");
        expected.push_back(
            {notificationChannel, "{\"filePath\":\"" + file + "\",\"isExistingFile\":false}"});
        expected.push_back({writeResponsePrefix + name, "true"});
    }
    const Outcome outcome = test::run(hostCommand({"stdio", "--max-message", "10MB"}), input);
    EXPECT_EQ(outcome.status, 0) << outcome.errors;
    EXPECT_EQ(messagesIn(outcome.output), expected);
}

// A reader that is slower than the bundle slows it down, instead of letting answers pile up.
TEST_F(StdioCommand, KeepsItsMemoryBoundedWhenRequestsComeFasterThanAnswersAreTaken) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "sanitizers use memory of their own";
#endif
    constexpr std::size_t count = 1500;
    writeFile(file_, std::string(500'000, 'x'));
    const Message answer = success("1", std::string(500'000, 'x'));
    const std::size_t answersSize = count * framed(answer.channel, answer.payload).size();

    test::Subprocess program(command_);
    std::future<void> written = std::async(std::launch::async, [&] {
        for (std::size_t i = 0; i < count; ++i) {
            program.write(framedReadRequest("1", file_));
        }
    });
    written.get();  // All requests are taken before the first answer is.
    std::size_t taken = 0;
    while (taken < answersSize) {
        const std::string some = program.readSome();
        ASSERT_FALSE(some.empty());
        taken += some.size();
    }
    EXPECT_LT(test::memoryOf(std::to_string(program.id()), "VmHWM"), 300'000'000U);
    EXPECT_EQ(program.finish().status, 0);
    EXPECT_EQ(taken, answersSize);
}

TEST_F(StdioCommand, EndsWhenItsOutputCannotBeWritten) {
    test::Subprocess program(command_);
    program.closeOutput();
    program.write(framedReadRequest("1", file_));
    // The input stays open: the program ends by itself.
    const Outcome outcome = program.waitForEnd();
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, HasSubstr("Broken pipe"));
}

// Whatever comes, the program ends in its own way and writes whole frames or nothing.
void expectSurvival(const std::string& input) {
    const Outcome outcome = test::run(hostCommand({"stdio"}), input);
    EXPECT_THAT(outcome.status, AnyOf(0, 2));
    EXPECT_NO_THROW(messagesIn(outcome.output));
}

TEST_F(StdioCommand, FinishesWhatItTookWhenItIsAskedToEnd) {
    const std::string begunFrame = framedReadRequest("2", file_).substr(0, 60);
    for (const int signal : {SIGTERM, SIGINT}) {
        test::Subprocess program(command_);
        program.write(framedReadRequest("1", file_) + begunFrame);
        const std::string answer = program.readSome();
        ::kill(program.id(), signal);
        const Outcome outcome = program.waitForEnd();
        EXPECT_EQ(outcome.status, 0);
        EXPECT_THAT(outcome.errors, IsEmpty());
        EXPECT_THAT(messagesIn(answer + outcome.output), ElementsAre(success("1", "text")));
    }
}

TEST_F(StdioCommand, LeavesNoFileBehindWhenItIsAskedToEndDuringSaves) {
    const std::string document = R"({"parts":[{"partUri":"/a.xml","contentType":"application/xml",)"
                                 R"("relationship":null,"content":")" +
                                 std::string(100'000, 'x') + R"("}],"relationships":[]})";
    const std::string file = folder_ / "document";
    const std::string request =
        framed(writeRequestChannel, R"({"rtcId":"1","contentType":"text/xml","filePath":")" + file +
                                        R"(","content":)" + document + "}");
    for (int run = 0; run < 10; ++run) {
        test::Subprocess program(command_);
        // As many as a pipe does not hold, so that some of them have been taken.
        for (int i = 0; i < 5; ++i) {
            program.write(request);
        }
        ::kill(program.id(), SIGTERM);
        const Outcome outcome = program.waitForEnd();
        EXPECT_EQ(outcome.status, 0) << outcome.errors;
        // An announcement and an answer each.
        EXPECT_GE(messagesIn(outcome.output).size(), 2U);
        EXPECT_EQ(messagesIn(outcome.output).size() % 2, 0U);
    }
    EXPECT_THAT(test::namesIn(folder_.path()), ElementsAre("document", "file"));
}

TEST_F(StdioCommand, SurvivesRandomBytes) {
    std::mt19937 random(3);
    for (int run = 0; run < 30; ++run) {
        std::string input(random() % 5000, '\0');
        std::generate(input.begin(), input.end(), [&] { return static_cast<char>(random()); });
        expectSurvival(input);
    }
}

// Changes some bytes of `text`.
std::string mutated(std::string text, std::mt19937& random) {
    for (unsigned change = 1 + random() % 4; change-- > 0 && !text.empty();) {
        const std::size_t at = random() % text.size();
        switch (random() % 3) {
            case 0:
                text[at] = static_cast<char>(random());
                break;
            case 1:
                text.erase(at, 1 + random() % 8);
                break;
            default:
                text.insert(at, text.substr(random() % text.size(), random() % 8));
        }
    }
    return text;
}

TEST_F(StdioCommand, SurvivesMutatedFrames) {
    std::mt19937 random(4);
    for (int run = 0; run < 30; ++run) {
        expectSurvival(mutated(framedReadRequest("1", file_) + framedReadRequest("2", file_) +
                                   framed("/nobody", "x"),
                               random) +
                       framedReadRequest("3", file_));
    }
}

TEST_F(StdioCommand, SurvivesMutatedRequestsAndAnswersTheNextOne) {
    std::mt19937 random(5);
    std::string input;
    for (int i = 0; i < 2000; ++i) {
        input += framed(readRequestChannel, mutated(test::readRequest("bad", file_), random));
    }
    const std::vector<Message> answers = answersTo(input + framedReadRequest("good", file_));
    EXPECT_EQ(std::count(answers.begin(), answers.end(), success("good", "text")), 1);
}

}  // namespace
