// SPDX-License-Identifier: Apache-2.0
// The command `history`, and what the commands that save keep for it.
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "platform/messaging/channels.h"
#include "tests/host/host_program.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::framed;
using test::hostCommand;
using test::Outcome;
using test::readFile;
using test::run;
using test::TemporaryDirectory;
using test::writeFile;

class HistoryCommand : public testing::Test {
protected:
    Outcome write(const std::string& text) {
        return run(hostCommand({"write", "--history", state_, file_}), text);
    }

    Outcome history(std::initializer_list<std::string> more) {
        std::vector<std::string> command = hostCommand({"history", "--history", state_, file_});
        command.insert(command.end(), more);
        return run(command);
    }

    // Saves a text of one byte through `stdio`.
    Outcome writeByStdio(std::initializer_list<std::string> more) {
        std::vector<std::string> command = hostCommand({"stdio", "--history", state_});
        command.insert(command.end(), more);
        return run(command, framed(platform::messaging::writeRequestChannel,
                                   R"({"rtcId":"1","contentType":"text/plain","filePath":")" +
                                       file_ + R"(","content":"x","encoding":"UTF-8"})"));
    }

    const TemporaryDirectory folder_;
    const std::string file_ = folder_ / "a.txt";
    const std::string state_ = folder_ / "state";
};

TEST_F(HistoryCommand, ListsNothingWhereNothingWasReplaced) {
    EXPECT_EQ(write("one").output, "true\n");
    const Outcome outcome = history({});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "");
}

TEST_F(HistoryCommand, ListsShowsAndRestoresWhatSavesReplaced) {
    for (const char* text : {"one", "second", "three"}) {
        ASSERT_EQ(write(text).output, "true\n");
    }
    const std::string list = history({}).output;
    EXPECT_TRUE(list.starts_with("1\t20") && list.find("\t6\n2\t20") != std::string::npos &&
                list.ends_with("\t3\n"))
        << list;
    EXPECT_EQ(history({"--show", "1"}).output, "{\"data\":\"second\",\"status\":true}\n");
    EXPECT_EQ(history({"--restore", "2"}).status, 0);
    EXPECT_EQ(readFile(file_), "one");
    EXPECT_EQ(history({"--show", "1"}).output, "{\"data\":\"three\",\"status\":true}\n");
}

TEST_F(HistoryCommand, SaysWhenThereIsNoSuchVersion) {
    const Outcome outcome = history({"--show", "1"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_NE(outcome.errors.find("has 0 earlier versions"), std::string::npos) << outcome.errors;
}

TEST_F(HistoryCommand, HasNothingOfSavesThatKeepNoVersions) {
    write("one");
    EXPECT_EQ(run(hostCommand({"write", "--history", state_, "--no-history", file_}), "two").output,
              "true\n");
    EXPECT_EQ(
        run(hostCommand({"write", "--history", state_, "--no-safe-saves", file_}), "three").output,
        "true\n");
    EXPECT_EQ(history({}).output, "");
}

TEST_F(HistoryCommand, HasWhatStdioReplacesWhenItSavesSafely) {
    writeFile(file_, "old");
    writeByStdio({});
    EXPECT_EQ(history({}).output, "");
    writeFile(file_, "old");
    writeByStdio({"--safe-saves"});
    EXPECT_TRUE(history({}).output.ends_with("\t3\n"));
}

TEST_F(HistoryCommand, CannotKeepVersionsWhereClientsCanReachThem) {
    const Outcome outcome = run(
        hostCommand({"serve", "--no-web", "--root", folder_.path().string(), "--history", state_}));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_NE(outcome.errors.find("which clients may use"), std::string::npos) << outcome.errors;
}

}  // namespace
