// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

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

std::string failureOf(const std::string& reason) {
    json::Object response;
    response["exception"] = reason;
    response["status"] = false;
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
        if (entry.is_regular_file()) {
            files.push_back(entry.path());
        }
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
    EXPECT_EQ(outcome.output, failureOf("the name is not UTF-8, as a request needs it") + "\n" +
                                  successOf("y") + "\n");
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

TEST_F(ReadCommand, SaysThatAnotherArchiveIsNoPackage) {
    const Outcome outcome = read({makeFile("archive", test::zipArchive({"part.xml"}))});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, HasSubstr("is not a document package"));
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
    EXPECT_EQ(outcome.output, failureOf("no answer") + "\n");
    EXPECT_THAT(outcome.errors, HasSubstr("file: no answer\n"));
}

TEST_F(ReadCommand, TakesAResponseThatIsNoneForAFailure) {
    const Outcome outcome =
        read({makeFile("file", ""), makeFile("garbled", "")}, {"--bundle", UNRESPONSIVE_BUNDLE});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, failureOf("no answer") + "\nno JSON\n");
    EXPECT_THAT(outcome.errors, HasSubstr("garbled: cannot be read"));
}

TEST_F(ReadCommand, GivesUpAfterTheTimeoutAndPrintsWhatHasCome) {
    const Outcome outcome = read({makeFile("stuck", ""), makeFile("answered", "")},
                                 {"--bundle", UNRESPONSIVE_BUNDLE, "--timeout", "1"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output,
              failureOf("no answer within 1 seconds") + "\n" + successOf("x") + "\n");
    EXPECT_THAT(outcome.errors, HasSubstr("stuck: no answer within 1 second"));
}

// A pipe that nobody writes to, a device, a folder.
TEST_F(ReadCommand, SaysThatNothingCanBeReadFromWhatIsNoFile) {
    const std::filesystem::path pipe = folder_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    for (const char* form : {"", "--utf8", "--text"}) {
        std::vector<std::string> options;
        if (*form != '\0') {
            options.emplace_back(form);
        }
        const Outcome outcome = read({pipe, "/dev/null", folder_.path()}, options);
        EXPECT_EQ(outcome.status, 1);
        EXPECT_THAT(linesOf(outcome.output), SizeIs(std::string(form) == "--text" ? 0 : 3));
        EXPECT_THAT(
            outcome.errors,
            AllOf(HasSubstr("pipe: nothing could be read: is a pipe"),
                  HasSubstr("/dev/null: nothing could be read: is a device"),
                  HasSubstr(folder_.path().string() + ": nothing could be read: is a folder")));
    }
}

TEST_F(ReadCommand, SaysThatAFileMayNotBeRead) {
    if (::geteuid() != 0 || !std::filesystem::exists("/usr/bin/setpriv")) {
        GTEST_SKIP() << "needs root, who reads every file, and setpriv to become somebody else";
    }
    std::filesystem::permissions(folder_.path(), std::filesystem::perms(0755));
    const std::filesystem::path file = makeFile("file", "secret");
    std::filesystem::permissions(file, std::filesystem::perms(0600));
    const Outcome outcome =
        test::run({"/usr/bin/setpriv", "--reuid=65534", "--regid=65534", "--clear-groups",
                   SERIALIZATION_HOST, "read", file.string()});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, successOf("") + "\n");
    EXPECT_THAT(outcome.errors, HasSubstr("nothing could be read: Permission denied"));
}

TEST_F(ReadCommand, SaysNothingOfAnEmptyFile) {
    const Outcome outcome = read({makeFile("file", "")});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_THAT(outcome.errors, IsEmpty());
}

TEST_F(ReadCommand, WarnsOfADocumentThatIsReadAsText) {
    const std::string package = test::zipArchive({"[Content_Types].xml", "part.xml"});
    const auto warning = [&](const std::string& bytes) {
        const Outcome outcome = read({makeFile("file", bytes)}, {"--content-type", "text/plain"});
        EXPECT_EQ(outcome.status, 0);
        return outcome.errors;
    };
    EXPECT_THAT(warning(package),
                HasSubstr("file is a zip archive, as document packages are, and was read"));
    EXPECT_THAT(warning("\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1 and so on"), HasSubstr("older kind"));
    EXPECT_THAT(warning("%PDF-1.7\n"), HasSubstr("PDF"));
    EXPECT_THAT(warning("PK"), IsEmpty());
}

// A pattern of the shell expands to such names as well.
TEST_F(ReadCommand, TakesAnArgumentForAFileThatHasTheNameOfNoOption) {
    makeFile("-dash.txt", "a");
    makeFile("--utf9", "b");
    makeFile("c", "c");
    const Outcome outcome = test::run({"/bin/sh", "-c", "cd \"$1\" && exec \"$0\" read *",
                                       SERIALIZATION_HOST, folder_.path().string()});
    EXPECT_EQ(outcome.status, 0) << outcome.errors;
    const std::vector<std::string> lines = linesOf(outcome.output);
    EXPECT_THAT(lines,
                ::testing::UnorderedElementsAre(successOf("a"), successOf("b"), successOf("c")));
}

TEST_F(ReadCommand, ReadsTheStandardInput) {
    const std::filesystem::path file = makeFile("file", "x");
    EXPECT_EQ(test::run(hostCommand({"read", "-", file.string(), "-"}), "piped").output,
              successOf("piped") + "\n" + successOf("x") + "\n" + successOf("piped") + "\n");
    const std::string report = test::sourceRoot() + "/examples/report.docx";
    EXPECT_EQ(test::run(hostCommand({"read", "-"}), readFile(report)).output,
              read({report}).output);
}

TEST_F(ReadCommand, PrintsValidUtf8WithPathAndCharsetWhenAsked) {
    const auto printed = [&](const std::string& bytes) {
        return read({makeFile("file", bytes)}, {"--utf8"}).output;
    };
    const std::string path = (folder_ / "file").string();
    const auto expected = [&](const std::string& text, const std::string& charset) {
        return R"({"data":")" + text + R"(","encoding":")" + charset + R"(","filePath":")" + path +
               "\",\"status\":true}\n";
    };
    EXPECT_EQ(printed("plain"), expected("plain", "UTF-8"));
    EXPECT_EQ(printed("\xEF\xBB\xBF\xC3\xA9"), expected("\xC3\xA9", "UTF-8"));
    EXPECT_EQ(printed(std::string("\xFE\xFF\x00\xE9", 4)), expected("\xC3\xA9", "UTF-16BE"));
    EXPECT_EQ(printed(""), expected("", "UTF-8"));
    EXPECT_EQ(read({folder_ / "caf\xE9"}, {"--utf8"}).output,
              R"({"exception":"the name is not UTF-8, as a request needs it","filePath":")" +
                  (folder_ / "caf\xEF\xBF\xBD").string() + "\",\"status\":false}\n");
}

TEST_F(ReadCommand, PrintsAPackageInValidUtf8WhenAsked) {
    const std::string report = test::sourceRoot() + "/examples/report.docx";
    const Outcome outcome = read({report}, {"--utf8"});
    EXPECT_EQ(outcome.status, 0);
    json::Object response = json::parse(outcome.output);
    EXPECT_EQ(response["filePath"].get<std::string>(), report);
    EXPECT_FALSE(response.contains("encoding"));
    response.erase("filePath");
    EXPECT_EQ(json::serialize(response) + "\n", read({report}).output);
}

TEST_F(ReadCommand, PrintsTheTextItselfWhenAsked) {
    const Outcome outcome = read({makeFile("a", "\xEF\xBB\xBFone\n"), folder_ / "missing",
                                  makeFile("b", std::string("\xFF\xFEt\0w\0o\0", 8))},
                                 {"--text"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, "one\ntwo");
    EXPECT_THAT(outcome.errors, HasSubstr("missing: File does not exist"));
}

TEST_F(ReadCommand, HasNoTextOfAPackage) {
    const Outcome outcome = read({test::sourceRoot() + "/examples/report.docx"}, {"--text"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, HasSubstr("read it without --text"));
}

// The program on a terminal, by the program `script`.
TEST_F(ReadCommand, ShowsOnATerminalThatItIsAtWork) {
    const std::string command = std::string(SERIALIZATION_HOST) + " read --bundle " +
                                UNRESPONSIVE_BUNDLE + " --timeout 2 stuck";
    const Outcome slow = test::run({"/usr/bin/script", "-qec", command, "/dev/null"});
    EXPECT_THAT(slow.output, HasSubstr("reading file 1 of 1, 1 s"));
    const std::string quick =
        std::string(SERIALIZATION_HOST) + " read " + test::sourceRoot() + "/examples/empty.txt";
    EXPECT_EQ(test::run({"/usr/bin/script", "-qec", quick, "/dev/null"}).output,
              successOf("") + "\r\n");
}

}  // namespace
