// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <initializer_list>
#include <sstream>
#include <string>
#include <vector>

#include "platform/messaging/channels.h"
#include "tests/host/host_program.h"
#include "tests/support/source_root.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::hostCommand;
using test::Outcome;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;

// A shell command in which "$0" is the program.
Outcome runInShell(const std::string& command) {
    return test::run({"/bin/sh", "-c", command, SERIALIZATION_HOST});
}

TEST(CommandLine, TellsItsCommandsAndOptions) {
    const Outcome outcome = test::run(hostCommand({"--help"}));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(outcome.output, AllOf(HasSubstr("read"), HasSubstr("stdio"), HasSubstr("--bundle"),
                                      HasSubstr("--log-level"), HasSubstr("--version")));
    EXPECT_THAT(outcome.errors, IsEmpty());
}

TEST(CommandLine, TellsTheOptionsOfACommand) {
    const Outcome read = test::run(hostCommand({"read", "--help"}));
    EXPECT_EQ(read.status, 0);
    EXPECT_THAT(read.output, AllOf(HasSubstr("--content-type"), HasSubstr("--timeout")));
    const Outcome stdio = test::run(hostCommand({"stdio", "--help"}));
    EXPECT_EQ(stdio.status, 0);
    EXPECT_THAT(stdio.output, HasSubstr("--max-message"));
}

TEST(CommandLine, TellsOfOptionsInLinesThatFitATerminal) {
    for (const char* command : {"", "read", "write", "history", "serve", "stdio"}) {
        const Outcome outcome = runInShell(std::string("\"$0\" ") + command + " --help");
        EXPECT_EQ(outcome.status, 0);
        // As the parser would show the default of an option such as --no-history.
        EXPECT_THAT(outcome.output, Not(HasSubstr("{"))) << command;
        std::istringstream lines(outcome.output);
        for (std::string line; std::getline(lines, line);) {
            EXPECT_LE(line.size(), 80U) << line;
        }
    }
}

TEST(CommandLine, TellsItsVersion) {
    const Outcome outcome = test::run(hostCommand({"--version"}));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "serialization_host " PROGRAM_VERSION "\n");
}

class WrongUsage : public ::testing::TestWithParam<std::vector<std::string>> {};

TEST_P(WrongUsage, EndsWithStatus2AndAnExplanation) {
    std::vector<std::string> command = hostCommand({});
    command.insert(command.end(), GetParam().begin(), GetParam().end());
    const Outcome outcome = test::run(command);
    EXPECT_EQ(outcome.status, 2);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, AllOf(StartsWith("serialization_host: "), HasSubstr("--help")));
}

INSTANTIATE_TEST_SUITE_P(
    CommandLine, WrongUsage,
    ::testing::Values(std::vector<std::string>{}, std::vector<std::string>{"unknown"},
                      std::vector<std::string>{"read"},
                      std::vector<std::string>{"read", "--unknown", "file"},
                      std::vector<std::string>{"read", "--timeout", "0", "file"},
                      std::vector<std::string>{"read", "--timeout", "soon", "file"},
                      std::vector<std::string>{"--log-level", "loud", "stdio"},
                      std::vector<std::string>{"stdio", "file"},
                      std::vector<std::string>{"stdio", "--max-message", "many"},
                      std::vector<std::string>{"stdio", "--max-message", "0"},
                      std::vector<std::string>{"--memory-limit", "16", "stdio"},
                      std::vector<std::string>{"--memory-limit", "63MB", "stdio"},
                      std::vector<std::string>{"--memory-limit", "-1", "stdio"},
                      std::vector<std::string>{"--memory-limit", "1.5GB", "stdio"},
                      std::vector<std::string>{"--memory-limit", "GB", "stdio"},
                      std::vector<std::string>{"--memory-limit", "100 apples", "stdio"},
                      std::vector<std::string>{"--memory-limit", "", "stdio"},
                      std::vector<std::string>{"--memory-limit", "18446744073709551616", "stdio"},
                      std::vector<std::string>{"--memory-limit", "16EB", "stdio"},
                      std::vector<std::string>{"read", "--text", "--utf8", "file"},
                      std::vector<std::string>{"write", "-"},
                      std::vector<std::string>{"write", "--text", "--content-type", "text/xml",
                                               "file"},
                      std::vector<std::string>{"stdio", "--bundle"}));

TEST(CommandLine, TakesSizesWithTheirUnits) {
    if (!LIMIT_MEMORY) {
        GTEST_SKIP() << "the sanitizers take more address space than there is memory";
    }
    for (const char* size : {"0", "67108864", "64MB", "64 mib", "65536K", "1g", "15EB"}) {
        EXPECT_EQ(runInShell(std::string("\"$0\" --memory-limit '") + size + "' stdio < /dev/null")
                      .status,
                  0)
            << size;
    }
    EXPECT_THAT(test::run(hostCommand({"--memory-limit", "16", "stdio"})).errors,
                HasSubstr("--memory-limit: 16 is too little: the program itself takes some 64 MB"));
    EXPECT_THAT(test::run(hostCommand({"--memory-limit", "much", "stdio"})).errors,
                HasSubstr("--memory-limit: \"much\" is no size such as 500MB"));
}

TEST(CommandLine, ShowsNoControlsOfNames) {
    for (const Outcome& outcome :
         {test::run(hostCommand({"--bundle", "/no/\x1B[31m\n.so", "stdio"})),
          test::run(hostCommand({"re\x1B[31m\nad", "file"}))}) {
        EXPECT_THAT(outcome.errors, HasSubstr("\\x1B[31m\\x0A"));
        EXPECT_THAT(outcome.errors, Not(HasSubstr("\x1B")));
    }
}

TEST(CommandLine, AsksForWhatWasProbablyMeant) {
    const auto complaintAbout = [](std::initializer_list<std::string> arguments) {
        return test::run(hostCommand(arguments)).errors;
    };
    EXPECT_THAT(complaintAbout({"raed", "file"}),
                HasSubstr("no command \"raed\"; did you mean \"read\"?"));
    EXPECT_THAT(complaintAbout({"wirte"}), HasSubstr("did you mean \"write\"?"));
    EXPECT_THAT(complaintAbout({"print"}), HasSubstr("no command \"print\"\n"));
    EXPECT_THAT(complaintAbout({"read", "--utf-8", "file"}),
                HasSubstr("no option \"--utf-8\"; did you mean \"--utf8\"?"));
    EXPECT_THAT(complaintAbout({"write", "--encodign=UTF-8", "file"}),
                HasSubstr("no option \"--encodign\"; did you mean \"--encoding\"?"));
    EXPECT_THAT(complaintAbout({"--log-levl", "off", "stdio"}),
                HasSubstr("did you mean \"--log-level\"?"));
    EXPECT_THAT(complaintAbout({}), HasSubstr("a command is missing"));
}

TEST(CommandLine, RefusesAnAddressOfNoServer) {
    for (const char* address : {"foo", "foo:4222", "http://foo", "nats://", "nats://a b",
                                "nats://foo:port", "nats://one,foo"}) {
        const Outcome outcome = test::run(hostCommand({"serve", "--nats", address}));
        EXPECT_EQ(outcome.status, 2) << address;
        EXPECT_THAT(outcome.errors, HasSubstr("not the address of a server, such as nats://"));
    }
}

TEST(CommandLine, NamesABundleThatIsMissing) {
    const Outcome outcome = test::run(hostCommand({"--bundle", "/no/such/bundle.so", "stdio"}));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors,
                AllOf(StartsWith("serialization_host: "), HasSubstr("/no/such/bundle.so")));
}

TEST(CommandLine, NamesABundleThatIsNoLibrary) {
    const std::string file = test::sourceRoot() + "/examples/server.log";
    const Outcome outcome = test::run(hostCommand({"read", "--bundle", file, file}));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, AllOf(StartsWith("serialization_host: "), HasSubstr(file)));
}

// The program in a folder of its own with the library that it is linked to, apart from its bundle.
class CopiedProgram : public ::testing::Test {
protected:
    CopiedProgram() {
        const std::filesystem::path libraries = program_.parent_path() / INSTALLED_LIBRARY_FOLDER;
        std::filesystem::create_directories(program_.parent_path());
        std::filesystem::create_directories(libraries);
        std::filesystem::copy(SERIALIZATION_HOST, program_);
        std::filesystem::copy(MESSAGING_LIBRARY, libraries);
    }

    void copyBundleTo(const std::filesystem::path& folder) {
        std::filesystem::create_directories(folder);
        std::filesystem::copy(SERIALIZATION_BUNDLE, folder);
    }

    Outcome readExample() {
        return test::run({program_.string(), "read", test::sourceRoot() + "/examples/empty.txt"});
    }

    test::TemporaryDirectory folder_;
    std::filesystem::path program_ = folder_ / "a folder/bin/serialization_host";
};

TEST_F(CopiedProgram, FindsTheBundleInTheLibraryFolderBesideItsOwn) {
    copyBundleTo(folder_ / "a folder/lib");
    EXPECT_EQ(readExample().output, "{\"data\":\"\",\"status\":true}\n");
}

TEST_F(CopiedProgram, FindsTheBundleWhereItIsInstalled) {
    copyBundleTo(folder_ / "a folder/bin" / INSTALLED_BUNDLE_FOLDER);
    EXPECT_EQ(readExample().output, "{\"data\":\"\",\"status\":true}\n");
}

TEST_F(CopiedProgram, TellsWhereItLookedForABundle) {
    const Outcome outcome = readExample();
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors,
                HasSubstr((folder_ / "a folder/lib/libcom_vorplanex_serialization.so").string()));
    EXPECT_THAT(outcome.errors, HasSubstr("--bundle"));
}

TEST(Installation, HoldsAllThatTheProgramNeeds) {
    const test::TemporaryDirectory folder;
    const Outcome installation =
        test::run({CMAKE_COMMAND, "--install", PROJECT_BINARY_ROOT, "--prefix", folder.path()});
    ASSERT_EQ(installation.status, 0) << installation.errors;
    const Outcome outcome = test::run(
        {folder / "bin/serialization_host", "read", test::sourceRoot() + "/examples/empty.txt"});
    EXPECT_EQ(outcome.status, 0) << outcome.errors;
    EXPECT_EQ(outcome.output, "{\"data\":\"\",\"status\":true}\n");
    const std::filesystem::path web = folder / "bin" / INSTALLED_WEB_FOLDER;
    // The page is there when it has been built.
    const std::filesystem::path built = test::sourceRoot() + "/web/dist";
    for (const char* file : {"index.html", "main.js", "main.css", "icon.svg", "LICENSES.txt"}) {
        EXPECT_EQ(std::filesystem::exists(web / file), std::filesystem::exists(built / file))
            << file;
    }
    EXPECT_FALSE(std::filesystem::exists(web / "node_modules"));
}

TEST(StandardOutput, CarriesNothingThatALibraryPrints) {
    const Outcome outcome = test::run(hostCommand({"--bundle", UNRESPONSIVE_BUNDLE, "stdio"}));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors,
                AllOf(HasSubstr("printed with puts"), HasSubstr("printed with cout")));
}

TEST(StandardOutput, ThatIsFullIsAnError) {
    for (const std::string& command : {std::string("--version"), std::string("--help"),
                                       "read '" + test::sourceRoot() + "/examples/empty.txt'"}) {
        const Outcome outcome = runInShell("\"$0\" " + command + " >/dev/full");
        EXPECT_EQ(outcome.status, 1) << command;
        EXPECT_THAT(outcome.errors, HasSubstr("No space left on device")) << command;
    }
}

TEST(StandardOutput, WhoseReaderIsGoneEndsTheProgramWithoutAWord) {
    test::Subprocess program(hostCommand({"read", test::sourceRoot() + "/examples/server.log",
                                          test::sourceRoot() + "/examples/server.log"}));
    program.closeOutput();
    const Outcome outcome = program.finish();
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, IsEmpty());
}

TEST(StandardStreams, ThatAreClosedAreNotTakenForOthers) {
    const Outcome outcome =
        runInShell("\"$0\" read '" + test::sourceRoot() + "/examples/empty.txt' <&- 2>&-");
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "{\"data\":\"\",\"status\":true}\n");
}

TEST(StandardStreams, ThatAreClosedAreErrorsToWhomNeedsThem) {
    const test::TemporaryDirectory folder;
    const std::string file = folder / "file";
    test::writeFile(file, "old");

    Outcome outcome = runInShell("\"$0\" write '" + file + "' <&-");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, HasSubstr("cannot read the standard input"));
    EXPECT_EQ(test::readFile(file), "old");

    EXPECT_EQ(runInShell("\"$0\" stdio <&-").status, 1);

    outcome = runInShell("\"$0\" read '" + file + "' >&-");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, HasSubstr("cannot write to the standard output"));
}

TEST(LogLevel, SilencesTheHost) {
    const std::string missing = "/no/such/file";
    EXPECT_THAT(test::run(hostCommand({"read", missing})).errors, HasSubstr(missing));
    EXPECT_THAT(test::run(hostCommand({"--log-level", "off", "read", missing})).errors, IsEmpty());
}

// A request that is no JSON makes the messaging library log the handler's failure.
TEST(LogLevel, HoldsForTheMessagingLibrary) {
    const std::string request = test::framed(platform::messaging::readRequestChannel, "no JSON");
    EXPECT_THAT(test::run(hostCommand({"stdio"}), request).errors,
                HasSubstr(platform::messaging::readRequestChannel));
    EXPECT_THAT(test::run(hostCommand({"stdio", "--log-level", "off"}), request).errors, IsEmpty());
}

}  // namespace
