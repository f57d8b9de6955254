// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "tests/host/host_program.h"
#include "tests/platform/i18n/detection/corpus.h"
#include "tests/support/source_root.h"
#include "tests/support/subprocess.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::hostCommand;
using test::Outcome;
using test::readFile;
using test::writeFile;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class WriteCommand : public ::testing::Test {
protected:
    static Outcome write(const std::filesystem::path& file, const std::string& content,
                         const std::vector<std::string>& options = {}) {
        std::vector<std::string> command = hostCommand({"write"});
        command.insert(command.end(), options.begin(), options.end());
        command.emplace_back("--");
        command.push_back(file.string());
        return test::run(command, content);
    }

    bool holdsATemporaryFile() const {
        const std::filesystem::directory_iterator entries(folder_.path());
        return std::any_of(begin(entries), end(entries), [](const auto& entry) {
            return entry.path().filename().string().starts_with(".~saving-");
        });
    }

    test::TemporaryDirectory folder_;
};

TEST_F(WriteCommand, WritesItsInputAndPrintsTrue) {
    const Outcome outcome = write(folder_ / "file", "one\ntwo \"quoted\"\n");
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "true\n");
    EXPECT_THAT(outcome.errors, IsEmpty());
    EXPECT_EQ(readFile(folder_ / "file"), "one\ntwo \"quoted\"\n");
}

TEST_F(WriteCommand, WritesAnEmptyInput) {
    writeFile(folder_ / "file", "old");
    EXPECT_EQ(write(folder_ / "file", "").output, "true\n");
    EXPECT_EQ(readFile(folder_ / "file"), "");
}

TEST_F(WriteCommand, WritesTextInTheCharsetThatItIsGiven) {
    EXPECT_EQ(write(folder_ / "file", "\xCF\xF0\xE8", {"--encoding", "windows-1251"}).output,
              "true\n");
    EXPECT_EQ(readFile(folder_ / "file"), "\xCF\xF0\xE8");
}

TEST_F(WriteCommand, PrintsFalseForTextThatIsNotInItsCharset) {
    writeFile(folder_ / "file", "old");
    const Outcome outcome = write(folder_ / "file", "\xCF\xF0\xE8");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, "false\n");
    EXPECT_THAT(outcome.errors, HasSubstr("file: cannot be written"));
    EXPECT_EQ(readFile(folder_ / "file"), "old");
}

TEST_F(WriteCommand, WritesAPackageThatReadHasPrinted) {
    const std::string report = test::sourceRoot() + "/examples/report.docx";
    const Outcome original = test::run(hostCommand({"read", report}));
    ASSERT_EQ(original.status, 0);
    EXPECT_EQ(write(folder_ / "copy.docx", original.output).output, "true\n");
    EXPECT_EQ(test::run(hostCommand({"read", (folder_ / "copy.docx").string()})).output,
              original.output);
}

TEST_F(WriteCommand, WritesAPackagesJsonAsTextWhenTold) {
    const std::string json = R"({"parts":[],"relationships":[]})";
    EXPECT_EQ(write(folder_ / "file.json", json, {"--content-type", "text/plain"}).output,
              "true\n");
    EXPECT_EQ(readFile(folder_ / "file.json"), json);
}

TEST_F(WriteCommand, RefusesToMakeAPackageOfSomethingElse) {
    const Outcome outcome =
        write(folder_ / "file.docx", "plain text", {"--content-type", "text/xml"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, HasSubstr("not a document package"));
    EXPECT_FALSE(std::filesystem::exists(folder_ / "file.docx"));
}

// Each of these was once written over the document.
class NoPackage : public WriteCommand, public ::testing::WithParamInterface<std::string> {
protected:
    const std::string report_ = readFile(test::sourceRoot() + "/examples/report.docx");
};

TEST_P(NoPackage, IsNotWrittenOverADocument) {
    for (const std::string name : {"report.docx", "another name"}) {
        writeFile(folder_ / name, report_);
        const Outcome outcome = write(folder_ / name, GetParam());
        EXPECT_EQ(outcome.status, 1);
        EXPECT_THAT(outcome.output, IsEmpty());
        EXPECT_THAT(outcome.errors, HasSubstr(name + " is a document package"));
        EXPECT_THAT(outcome.errors, HasSubstr("--content-type text/plain"));
        EXPECT_TRUE(readFile(folder_ / name) == report_);
    }
}

TEST_P(NoPackage, IsNotWrittenUnderADocumentsName) {
    std::filesystem::create_symlink("Slides.PPTX", folder_ / "link");
    for (const std::string name : {"new.docx", "Budget.XLSX", "link"}) {
        EXPECT_EQ(write(folder_ / name, GetParam()).status, 1);
    }
    writeFile(folder_ / "empty.docx", "");
    EXPECT_EQ(write(folder_ / "empty.docx", GetParam()).status, 1);
    for (const std::string name : {"new.docx", "Budget.XLSX", "Slides.PPTX"}) {
        EXPECT_FALSE(std::filesystem::exists(folder_ / name));
    }
}

TEST_P(NoPackage, IsWrittenOverADocumentWhenItIsSaidToBeText) {
    writeFile(folder_ / "report.docx", report_);
    EXPECT_EQ(write(folder_ / "report.docx", GetParam(), {"--content-type", "text/plain"}).output,
              "true\n");
    EXPECT_EQ(readFile(folder_ / "report.docx"), GetParam());
}

INSTANTIATE_TEST_SUITE_P(
    WriteCommand, NoPackage,
    ::testing::Values("", "some text", R"({"exception":"File does not exist","status":false})",
                      R"({"parts":[],"relationships":[)", R"({"parts":[]})",
                      R"({"parts":[],"relationships":[]}{"parts":[],"relationships":[]})"));

TEST_F(WriteCommand, TakesAPackageWithWhiteSpaceAroundIt) {
    const std::filesystem::path file = folder_ / "report.docx";
    const std::string report = test::sourceRoot() + "/examples/report.docx";
    const std::string json = test::run(hostCommand({"read", report})).output;
    EXPECT_EQ(write(file, " \n\t" + json + "\r\n").output, "true\n");
    EXPECT_EQ(test::run(hostCommand({"read", file.string()})).output, json);
}

TEST_F(WriteCommand, SaysWhyItCannotWrite) {
    const auto reason = [&](const std::filesystem::path& file, const std::string& content,
                            const std::vector<std::string>& options) {
        const Outcome outcome = write(file, content, options);
        EXPECT_EQ(outcome.status, 1);
        EXPECT_EQ(outcome.output, "false\n");
        return outcome.errors;
    };
    writeFile(folder_ / "file", "KEEP");
    const std::filesystem::path file = folder_ / "file";
    EXPECT_THAT(reason(file, "x", {"--encoding", "klingon"}),
                HasSubstr("Unknown charset \"klingon\""));
    EXPECT_THAT(reason(file, "ab\xE9", {}), HasSubstr("as UTF-8: malformed input at byte 2"));
    EXPECT_EQ(readFile(file), "KEEP");
    EXPECT_THAT(reason(folder_ / "none/file", "x", {}),
                HasSubstr("the folder " + (folder_ / "none").string() + " does not exist"));
    EXPECT_THAT(reason(file / "file", "x", {}), HasSubstr("Not a directory"));
    EXPECT_THAT(reason(folder_.path(), "x", {}), HasSubstr("is a folder"));
    const Outcome outcome = write(folder_ / std::string(300, 'x'), "x");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, HasSubstr("no answer: File name too long"));
}

TEST_F(WriteCommand, SaysThatAFileMayNotBeWritten) {
    if (::geteuid() != 0 || !std::filesystem::exists("/usr/bin/setpriv")) {
        GTEST_SKIP() << "needs root, who writes every file, and setpriv to become somebody else";
    }
    std::filesystem::permissions(folder_.path(), std::filesystem::perms(0755));
    writeFile(folder_ / "file", "KEEP");
    for (const char* name : {"file", "new file"}) {
        const Outcome outcome =
            test::run({"/usr/bin/setpriv", "--reuid=65534", "--regid=65534", "--clear-groups",
                       SERIALIZATION_HOST, "write", (folder_ / name).string()},
                      "text");
        EXPECT_EQ(outcome.status, 1);
        EXPECT_THAT(outcome.errors, HasSubstr("Permission denied"));
    }
    EXPECT_EQ(readFile(folder_ / "file"), "KEEP");
}

TEST_F(WriteCommand, NamesThePartThatItCannotWriteAsItIs) {
    for (const char* content :
         {"\xFF", "a\\u0000", "\x7F", "\xC2\x80", "\xE2\x80\x8B", "\xEF\xBF\xBE", "\xEF\xBF\xBF"}) {
        const Outcome outcome = write(
            folder_ / "file.docx",
            R"({"parts":[{"partUri":"/macros.bin","contentType":"application/x-macros","content":")" +
                std::string(content) + R"(","relationship":null}],"relationships":[]})");
        EXPECT_EQ(outcome.output, "false\n") << content;
        EXPECT_THAT(outcome.errors, HasSubstr("the part /macros.bin is not plain text"));
        EXPECT_FALSE(std::filesystem::exists(folder_ / "file.docx"));
    }
}

TEST_F(WriteCommand, WritesNoPackageThatWasPrintedWithOtherBytes) {
    const std::string report = readFile(test::sourceRoot() + "/examples/report.docx");
    const std::filesystem::path file = folder_ / "file.docx";
    writeFile(file, report);
    json::Object package = json::parse(test::run(hostCommand({"read", file.string()})).output);
    package["parts"].get<json::Array>().push_back(
        json::Object{{"partUri", "/notes.txt"},
                     {"contentType", "text/plain"},
                     {"content", "caf\xE9"},
                     {"relationship", json::Value(json::Null())}});
    EXPECT_EQ(write(file, json::serialize(json::Value(package))).output, "true\n");
    const std::string written = readFile(file);
    const std::string printed = test::run(hostCommand({"read", "--utf8", file.string()})).output;
    EXPECT_THAT(printed, HasSubstr(R"("brokenParts":["/notes.txt"])"));
    const Outcome outcome = write(file, printed);
    EXPECT_EQ(outcome.output, "false\n");
    EXPECT_THAT(outcome.errors, HasSubstr(R"(the bytes of ["/notes.txt"] were replaced)"));
    EXPECT_TRUE(readFile(file) == written);
}

TEST_F(WriteCommand, StoresUtf8TextInTheFilesOwnCharsetWithItsMark) {
    writeFile(folder_ / "file", std::string("\xFF\xFE"
                                            "a\0b\0",
                                            6));
    EXPECT_EQ(write(folder_ / "file", "c\xC3\xA9", {"--text"}).output, "true\n");
    EXPECT_EQ(readFile(folder_ / "file"), std::string("\xFF\xFE"
                                                      "c\0\xE9\0",
                                                      6));
    EXPECT_EQ(write(folder_ / "file", "\xC3\xA8", {"--text", "--encoding", "ISO-8859-1"}).output,
              "true\n");
    EXPECT_EQ(readFile(folder_ / "file"), "\xE8");
    EXPECT_EQ(write(folder_ / "new", "\xC3\xA9", {"--text"}).output, "true\n");
    EXPECT_EQ(readFile(folder_ / "new"), "\xC3\xA9");
}

TEST_F(WriteCommand, LeavesItToTheFileWhetherItHasAMark) {
    const std::string mark = "\xEF\xBB\xBF";
    for (const auto& [before, input, after] :
         {std::array{mark + "one", mark + "two", mark + "two"},
          std::array{std::string("one"), mark + "two", std::string("two")},
          std::array{mark + "one", std::string("two"), mark + "two"},
          std::array{mark + mark + "one", mark + "two", mark + mark + "two"},
          std::array{std::string(), mark + "two", mark + "two"}}) {
        writeFile(folder_ / "file", before);
        EXPECT_EQ(write(folder_ / "file", input, {"--text"}).output, "true\n");
        EXPECT_EQ(readFile(folder_ / "file"), after);
    }
}

TEST_F(WriteCommand, NamesTheCharactersThatDoNotFitAndKeepsTheFile) {
    writeFile(folder_ / "file", "KEEP");
    const Outcome outcome =
        write(folder_ / "file", "caf\xC3\xA9\n10 \xE2\x82\xAC, \xE2\x82\xAC and \xF0\x9F\x98\x80",
              {"--text", "--encoding", "ISO-8859-1"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors,
                HasSubstr("ISO-8859-1 has no \"\xE2\x82\xAC\" (U+20AC) at line 2, column 4, "
                          "\"\xF0\x9F\x98\x80\" (U+1F600) at line 2, column 13\n"));
    EXPECT_EQ(readFile(folder_ / "file"), "KEEP");
}

TEST_F(WriteCommand, RefusesATextThatIsNotTheUtf8ItIsSaidToBe) {
    writeFile(folder_ / "file", "KEEP");
    const Outcome outcome = write(folder_ / "file", "caf\xE9 ", {"--text"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors, HasSubstr("UTF-8: malformed input at byte 3"));
    EXPECT_EQ(readFile(folder_ / "file"), "KEEP");
}

TEST_F(WriteCommand, PutsNoTextInThePlaceOfADocument) {
    const std::string report = readFile(test::sourceRoot() + "/examples/report.docx");
    writeFile(folder_ / "report", report);
    EXPECT_EQ(write(folder_ / "report", "text", {"--text"}).status, 1);
    EXPECT_TRUE(readFile(folder_ / "report") == report);
}

// What read --text prints of a file, written back to it.
std::string writtenBack(const std::filesystem::path& file, const std::string& bytes) {
    writeFile(file, bytes);
    const Outcome text = test::run(hostCommand({"read", "--text", "--", file.string()}));
    EXPECT_EQ(text.status, 0) << text.errors;
    const Outcome written =
        test::run(hostCommand({"write", "--text", "--", file.string()}), text.output);
    EXPECT_EQ(written.output, "true\n") << written.errors;
    return readFile(file);
}

// In each charset once; the bundle's own tests go through all languages.
TEST_F(WriteCommand, LeavesAFileAsItWasWhenItsTextIsWrittenBack) {
    std::set<std::string> seen;
    for (const auto& entry : test::corpusEntries()) {
        if (!seen.insert(entry.charset).second) {
            continue;
        }
        const std::optional<std::string> bytes =
            test::iconvEncode(entry.iconvName, test::corpusText(entry.language));
        if (bytes) {
            EXPECT_TRUE(writtenBack(folder_ / "file", *bytes) == *bytes)
                << entry.language << " in " << entry.charset;
        }
    }
}

TEST_F(WriteCommand, LeavesMarksAndStrayBytesAsTheyWereWhenATextIsWrittenBack) {
    using namespace std::string_literals;
    for (const std::string& bytes :
         {""s, "\xEF\xBB\xBF"s, "\xEF\xBB\xBFtext"s, "\xEF\xBB\xBF\xEF\xBB\xBFtwo marks"s,
          "\xFF\xFEx\0"s, "\xFE\xFF\0x"s, "\xFF\xFE\0\0x\0\0\0"s, "\0\0\xFE\xFF\0\0\0x"s,
          "one\r\ntwo\rthree"s, "zero\0byte"s, "\x80\x81\xFE\xFF\x90"s,
          "{\"parts\":[],\"relationships\":[]}"s, "\x1B$B$3$l\x1B(J and Roman"s}) {
        EXPECT_EQ(writtenBack(folder_ / "file", bytes), bytes);
    }
}

// The end-of-file mark of DOS, as tables of the IBM family have it, is given its usual code.
TEST_F(WriteCommand, MendsTheEndOfADosTextInShiftJis) {
    const std::string text = "\x83\x65\x83\x4C\x83\x58\x83\x67\x82\xC5\x82\xB7\x81\x42\x1C";
    const std::string again = writtenBack(folder_ / "file", text);
    EXPECT_EQ(again.substr(0, text.size() - 1), text.substr(0, text.size() - 1));
    EXPECT_EQ(again.back(), '\x1A');
}

TEST_F(WriteCommand, FinishesTheSaveInWhichItIsAskedToEnd) {
    // Much to write and little to compute, so that the temporary file is there for a while.
    const std::string content =
        R"({"parts":[{"partUri":"/a.png","contentType":"image/png","relationship":null,)"
        R"("content":"data:image/png;base64,)" +
        std::string(40'000'000, 'A') + R"("}],"relationships":[]})";
    const std::filesystem::path file = folder_ / "document";
    bool wasAskedInTime = false;
    for (int run = 0; run < 20 && !wasAskedInTime; ++run) {
        std::filesystem::remove(file);
        test::Subprocess program(hostCommand({"write", "--", file.string()}));
        program.write(content);
        program.closeInput();
        while (!std::filesystem::exists(file) && !wasAskedInTime) {
            wasAskedInTime = holdsATemporaryFile();
        }
        ::kill(program.id(), SIGTERM);
        const Outcome outcome = program.waitForEnd();
        if (wasAskedInTime) {
            EXPECT_EQ(outcome.status, 0) << outcome.errors;
            EXPECT_EQ(outcome.output, "true\n");
        }
        EXPECT_TRUE(std::filesystem::exists(file));
        EXPECT_FALSE(holdsATemporaryFile());
    }
    EXPECT_TRUE(wasAskedInTime);
}

TEST_F(WriteCommand, TellsThatNoAnswerCame) {
    const Outcome outcome = write(folder_ / "caf\xE9", "x");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.output, IsEmpty());
    EXPECT_THAT(outcome.errors, HasSubstr("no answer"));
}

TEST_F(WriteCommand, WritesLargeTexts) {
    std::string text;
    while (text.size() < 20'000'000) {
        text += "line " + std::to_string(text.size()) + "\n";
    }
    EXPECT_EQ(write(folder_ / "file", text).output, "true\n");
    EXPECT_TRUE(readFile(folder_ / "file") == text);
}

// The program on a terminal, by the program `script`.
TEST_F(WriteCommand, ShowsOnATerminalThatItIsAtWork) {
    const std::string file = folder_ / "file";
    const auto shown = [&](const std::string& input) {
        const std::string command = "(" + input + ") | " SERIALIZATION_HOST " write " + file;
        return test::run({"/usr/bin/script", "-qec", command, "/dev/null"}).output;
    };
    EXPECT_THAT(shown("printf x; sleep 3"), HasSubstr("reading the input, 0 MB, "));
    EXPECT_EQ(shown("printf x"), "true\r\n");
}

TEST_F(WriteCommand, NeedsOneFile) {
    EXPECT_EQ(test::run(hostCommand({"write"})).status, 2);
    EXPECT_EQ(test::run(hostCommand({"write", "one", "two"})).status, 2);
}

}  // namespace
