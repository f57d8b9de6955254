// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include "json/parser.h"
#include "json/value.h"
#include "tests/host/host_program.h"
#include "tests/host/zip_archive.h"
#include "tests/support/source_root.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::hostCommand;
using test::Outcome;
using test::readFile;
using test::writeFile;
using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

std::vector<std::string> linesOf(const std::string& text) {
    std::istringstream stream(text);
    std::vector<std::string> lines;
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

Outcome read(const std::vector<std::filesystem::path>& files,
             const std::vector<std::string>& options = {}) {
    std::vector<std::string> command = hostCommand({"read"});
    command.insert(command.end(), options.begin(), options.end());
    command.emplace_back("--");
    for (const std::filesystem::path& file : files) {
        command.push_back(file.string());
    }
    return test::run(command);
}

std::string successOf(const std::string& text) {
    json::Object response;
    response["data"] = text;
    response["status"] = true;
    return json::serialize(response);
}

// The bytes of a file but for the byte-order mark that they begin with.
std::string withoutMark(const std::string& bytes) {
    for (const std::string mark : {"\xEF\xBB\xBF", "\xFF\xFE"}) {
        if (bytes.starts_with(mark)) {
            return bytes.substr(mark.size());
        }
    }
    return bytes;
}

class ReadCommand : public ::testing::Test {
protected:
    std::filesystem::path makeFile(const std::string& name, const std::string& bytes) {
        writeFile(folder_ / name, bytes);
        return folder_ / name;
    }

    test::TemporaryDirectory folder_;
};

TEST(Examples, AreAllRead) {
    std::vector<std::filesystem::path> files;
    for (const auto& entry :
         std::filesystem::directory_iterator(test::sourceRoot() + "/examples")) {
        files.push_back(entry.path());
    }
    const Outcome outcome = read(files);
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(outcome.errors, IsEmpty());
    const std::vector<std::string> lines = linesOf(outcome.output);
    ASSERT_THAT(lines, SizeIs(files.size()));
    for (std::size_t i = 0; i < files.size(); ++i) {
        SCOPED_TRACE(files[i]);
        json::Object response = json::parse(lines[i]);
        const std::string extension = files[i].extension();
        if (extension == ".docx" || extension == ".pptx" || extension == ".xlsx") {
            EXPECT_THAT(response["parts"].get<json::Array>(), Not(IsEmpty()));
        } else {
            EXPECT_EQ(response["data"].get<std::string>(), withoutMark(readFile(files[i])));
        }
    }
}

TEST_F(ReadCommand, PrintsExactlyTheResponseAndALineFeed) {
    const Outcome outcome = read({makeFile("file", "one\ntwo \"quoted\"\n")});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "{\"data\":\"one\\ntwo \\\"quoted\\\"\\n\",\"status\":true}\n");
    EXPECT_THAT(outcome.errors, IsEmpty());
}

TEST_F(ReadCommand, PrintsTheResponsesInTheOrderOfTheFiles) {
    std::vector<std::filesystem::path> files;
    std::string expected;
    for (int i = 0; i < 50; ++i) {
        // Every third file is large, so that those behind it are read sooner.
        const std::string text = std::string(i % 3 == 0 ? 2'000'000 : 1, 'x') + std::to_string(i);
        files.push_back(makeFile(std::to_string(i), text));
        expected += successOf(text) + "\n";
    }
    const Outcome outcome = read(files);
    EXPECT_EQ(outcome.status, 0);
    EXPECT_TRUE(outcome.output == expected);
}

TEST_F(ReadCommand, AnswersAFileThatIsNamedTwiceTwice) {
    const std::filesystem::path file = makeFile("file", "x");
    EXPECT_EQ(read({file, file}).output, successOf("x") + "\n" + successOf("x") + "\n");
}

TEST_F(ReadCommand, TellsOfAMissingFileAndReadsTheOthers) {
    const Outcome outcome = read({folder_ / "missing", makeFile("file", "x")});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output,
              "{\"exception\":\"File does not exist\",\"status\":false}\n" + successOf("x") + "\n");
    EXPECT_THAT(outcome.errors, HasSubstr("missing: File does not exist"));
}

TEST_F(ReadCommand, TakesFileNamesWithAnyCharacters) {
    for (const std::string name :
         {"with blanks", "\"quoted\" \\ 'and' more", "line\nfeed", "-leading-hyphen", "stdio",
          "\xE3\x83\x95\xE3\x82\xA1\xE3\x82\xA4\xE3\x83\xAB", "\xF0\x9F\x98\x80"}) {
        const Outcome outcome = read({makeFile(name, name)});
        EXPECT_EQ(outcome.output, successOf(name) + "\n");
        EXPECT_EQ(outcome.status, 0);
    }
}

TEST_F(ReadCommand, TellsOfANameThatIsNotUtf8AndReadsTheOthers) {
    const Outcome outcome = read({makeFile("caf\xE9", "x"), makeFile("file", "y")});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, successOf("y") + "\n");
    EXPECT_THAT(outcome.errors, AllOf(HasSubstr("caf\\xE9"), HasSubstr("not UTF-8")));
    EXPECT_THAT(outcome.errors, Not(HasSubstr("no answer")));
}

TEST_F(ReadCommand, AsksForAPackageWhereThereIsOne) {
    const Outcome outcome =
        read({makeFile("package", test::zipArchive({"[Content_Types].xml", "part.xml"}))});
    const std::vector<std::string> lines = linesOf(outcome.output);
    ASSERT_THAT(lines, SizeIs(1));
    EXPECT_FALSE(json::parse(lines[0]).contains("data"));
}

TEST_F(ReadCommand, AsksForTextWhereThereIsNoPackage) {
    const std::string archive = test::zipArchive({"part.xml"});
    EXPECT_EQ(read({makeFile("archive", archive)}).output, successOf(archive) + "\n");
}

TEST_F(ReadCommand, AsksForTheContentTypeThatItIsGiven) {
    const std::string package = test::zipArchive({"[Content_Types].xml", "part.xml"});
    EXPECT_EQ(read({makeFile("package", package)}, {"--content-type", "text/plain"}).output,
              successOf(package) + "\n");

    const Outcome outcome = read({makeFile("text", "x")}, {"--content-type", "text/xml"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(linesOf(outcome.output), ElementsAre(EndsWith("\"status\":false}")));
}

TEST_F(ReadCommand, KnowsThatNoAnswerComesOnceTheBusIsIdle) {
    const Outcome outcome = read({makeFile("file", "x")}, {"--bundle", UNRESPONSIVE_BUNDLE});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, HasSubstr("file: no answer\n"));
}

TEST_F(ReadCommand, TakesAResponseThatIsNoneForAFailure) {
    const Outcome outcome =
        read({makeFile("file", ""), makeFile("garbled", "")}, {"--bundle", UNRESPONSIVE_BUNDLE});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, "no JSON\n");
    EXPECT_THAT(outcome.errors, HasSubstr("garbled: cannot be read"));
}

TEST_F(ReadCommand, GivesUpAfterTheTimeoutAndPrintsWhatHasCome) {
    const Outcome outcome = read({makeFile("stuck", ""), makeFile("answered", "")},
                                 {"--bundle", UNRESPONSIVE_BUNDLE, "--timeout", "1"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, successOf("x") + "\n");
    EXPECT_THAT(outcome.errors, HasSubstr("stuck: no answer within 1 second"));
}

// A pipe that nobody writes to, a device, a folder.
TEST_F(ReadCommand, DoesNotHangOnWhatIsNoFile) {
    const std::filesystem::path pipe = folder_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    const Outcome outcome = read({pipe, "/dev/null", folder_.path()});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, successOf("") + "\n" + successOf("") + "\n" + successOf("") + "\n");
}

}  // namespace
