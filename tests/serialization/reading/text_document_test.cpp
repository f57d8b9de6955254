// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <initializer_list>
#include <string>

#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::to_string;
using platform::i18n::to_ustring;
using test::writeFile;

class TextDocumentReading : public testing::Test {
protected:
    /// The path of a new file that holds `bytes`.
    std::u16string file(std::string_view bytes) {
        writeFile(folder / "file.txt", bytes);
        return to_ustring((folder / "file.txt").string());
    }

    std::string resultOf(std::u16string path) const {
        return json::serialize(json::Value(service.readTextDocument(std::move(path))));
    }

    static constexpr std::string_view shiftJisText =
        "\x82\xB1\x82\xEA\x82\xCD\x93\xFA\x96\x7B\x8C\xEA\x82\xCC\x95\xB6\x8F\xCD\x82\xC5\x82\xB7"
        "\x81\x42\x8A\xBF\x8E\x9A\x82\xC6\x82\xA9\x82\xC8\x82\xAA\x82\xA0\x82\xE8\x82\xDC\x82\xB7"
        "\x81\x42";

    Serialization service;
    test::TemporaryDirectory folder;
};

TEST_F(TextDocumentReading, AnswersWithTheTextOfTheFile) {
    EXPECT_EQ(resultOf(file("line one\nline two\n")),
              R"({"data":"line one\nline two\n","status":true})");
}

TEST_F(TextDocumentReading, AnswersThatAMissingFileDoesNotExist) {
    EXPECT_EQ(resultOf(to_ustring((folder / "missing").string())),
              R"({"exception":"File does not exist","status":false})");
}

TEST_F(TextDocumentReading, AnswersAnEmptyFileWithEmptyText) {
    EXPECT_EQ(resultOf(file("")), R"({"data":"","status":true})");
}

TEST_F(TextDocumentReading, TakesAnEmptyFileForUtf8) {
    std::string charset = "discarded";
    EXPECT_EQ(service.readTextFile(file(""), charset), u"");
    EXPECT_EQ(charset, "UTF-8");
}

TEST_F(TextDocumentReading, LeavesTheByteOrderMarkOut) {
    EXPECT_EQ(service.readTextFileContent(file("\xEF\xBB\xBFgr\xC3\xBCn")), "gr\xC3\xBCn");
}

TEST_F(TextDocumentReading, KeepsASecondByteOrderMark) {
    EXPECT_EQ(service.readTextFileContent(file("\xEF\xBB\xBF\xEF\xBB\xBFtext")),
              "\xEF\xBB\xBFtext");
}

TEST_F(TextDocumentReading, AnswersAFileThatHoldsOnlyAByteOrderMarkWithEmptyText) {
    EXPECT_EQ(resultOf(file("\xEF\xBB\xBF")), R"({"data":"","status":true})");
}

TEST_F(TextDocumentReading, KeepsUtf16InItsByteOrderWithoutTheMark) {
    const std::string little("\xFF\xFEh\0i\0", 6);
    EXPECT_EQ(service.readTextFileContent(file(little)), little.substr(2));
    const std::string big("\xFE\xFF\0h\0i", 6);
    EXPECT_EQ(service.readTextFileContent(file(big)), big.substr(2));
}

TEST_F(TextDocumentReading, KeepsCharactersOfTwoUnitsWithAndWithoutAMark) {
    for (const char* charset : {"UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE"}) {
        codecvt_ustring_to_string converter(charset, true);
        const std::string mark = to_string(u"\uFEFF", converter);
        const std::string text = to_string(u"a smile: \U0001F600, and a line\n", converter);
        EXPECT_EQ(service.readTextFileContent(file(mark + text)), text) << charset;
        EXPECT_EQ(service.readTextFileContent(file(text)), text) << charset;
    }
}

TEST_F(TextDocumentReading, SpellsEscapeSequencesAsTheConverterDoes) {
    EXPECT_EQ(service.readTextFileContent(file("\x1B$B$3$s")), "\x1B$B$3$s\x1B(B");
}

TEST_F(TextDocumentReading, KeepsTheBytesOfTheFilesOwnCharset) {
    std::string charset;
    const std::u16string text = service.readTextFile(file(shiftJisText), charset);
    EXPECT_EQ(charset, "Shift_JIS");
    EXPECT_EQ(text.substr(0, 5), u"\u3053\u308C\u306F\u65E5\u672C");
    EXPECT_EQ(service.readTextFileContent(file(shiftJisText)), shiftJisText);
}

TEST_F(TextDocumentReading, TurnsAFileSeparatorOfShiftJisIntoTheEndOfFileMark) {
    std::string charset;
    const std::u16string text =
        service.readTextFile(file(std::string(shiftJisText) + "\x1C,\x1A"), charset);
    ASSERT_EQ(charset, "Shift_JIS");
    EXPECT_EQ(text.substr(text.size() - 3), u"\u001A,\u001A");
    EXPECT_EQ(service.readTextFileContent(file(std::string(shiftJisText) + "\x1C,\x1A")),
              std::string(shiftJisText) + "\x1A,\x1A");
}

TEST_F(TextDocumentReading, KeepsAFileSeparatorInEveryOtherCharset) {
    EXPECT_EQ(service.readTextFileContent(file("a\x1C\x1Az")), "a\x1C\x1Az");
    const std::string russian =
        "\xD1\xFA\xE5\xF8\xFC \xE5\xF9\xB8 \xFD\xF2\xE8\xF5 \xEC\xFF\xE3\xEA\xE8\xF5 "
        "\xF4\xF0\xE0\xED\xF6\xF3\xE7\xF1\xEA\xE8\xF5 \xE1\xF3\xEB\xEE\xEA\x1C";
    EXPECT_EQ(service.readTextFileContent(file(russian)), russian);
}

TEST_F(TextDocumentReading, KeepsZeroBytesAndLineEndsOfEveryKind) {
    const std::string bytes("a\r\nb\rc\nd\0e", 10);
    EXPECT_EQ(service.readFileBytes(file(bytes)), bytes);
    EXPECT_EQ(service.readTextFileContent(file(bytes)), bytes);
}

TEST_F(TextDocumentReading, ReadsFilesOfAllSizesAroundTheReadersPieces) {
    for (const std::size_t size :
         std::initializer_list<std::size_t>{1, 4095, 4096, 4097, 8192, 65536, 1 << 20}) {
        std::string bytes(size, 'x');
        bytes.back() = 'y';
        EXPECT_EQ(service.readFileBytes(file(bytes)), bytes) << size;
    }
}

TEST_F(TextDocumentReading, ReadsFilesWhoseSizeTheSystemDoesNotKnow) {
    const std::string status = service.readFileBytes(u"/proc/self/status");
    EXPECT_TRUE(status.starts_with("Name:")) << status;
}

TEST_F(TextDocumentReading, AnswersAFileThatCannotBeOpenedWithEmptyText) {
    const std::u16string path = file("secret");
    ASSERT_EQ(::chmod((folder / "file.txt").c_str(), 0), 0);
    ASSERT_EQ(::chmod(folder.path().c_str(), 0755), 0);
    // A process of its own, because the super-user may open everything.
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        if (::geteuid() == 0 && ::setuid(65534) != 0) {
            ::_exit(2);
        }
        ::_exit(resultOf(path) == R"({"data":"","status":true})" ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST_F(TextDocumentReading, AnswersWhyTheSystemCannotTellWhetherTheFileExists) {
    const std::string result = resultOf(std::u16string(5000, u'x'));
    EXPECT_NE(result.find(R"("status":false)"), std::string::npos) << result;
    EXPECT_NE(result.find("File name too long"), std::string::npos) << result;
    EXPECT_EQ(result.find("data"), std::string::npos) << result;
}

TEST_F(TextDocumentReading, AnswersAFolderWithEmptyText) {
    EXPECT_EQ(resultOf(to_ustring(folder.path().string())), R"({"data":"","status":true})");
}

TEST_F(TextDocumentReading, NeverWaitsForAPipeNorReadsADevice) {
    ASSERT_EQ(::mkfifo((folder / "pipe").c_str(), 0600), 0);
    EXPECT_EQ(resultOf(to_ustring((folder / "pipe").string())), R"({"data":"","status":true})");
    EXPECT_EQ(resultOf(u"/dev/zero"), R"({"data":"","status":true})");
}

TEST_F(TextDocumentReading, AnswersAFileThatIsTooLargeBeforeItReadsIt) {
    // More than any machine has memory for, and no room on disk.
    test::writeFile(folder / "sparse", "");
    std::filesystem::resize_file(folder / "sparse", std::uintmax_t{1} << 40);
    EXPECT_EQ(resultOf(to_ustring((folder / "sparse").string())),
              R"({"exception":"The text is too large: 1099511627776 bytes, )"
              R"(at most 1073741824 are accepted","status":false})");
}

TEST_F(TextDocumentReading, AnswersAFileOfFourGigabytesWithItsSize) {
    test::writeFile(folder / "sparse", "");
    std::filesystem::resize_file(folder / "sparse", std::uintmax_t{1} << 32);
    EXPECT_EQ(resultOf(to_ustring((folder / "sparse").string())),
              R"({"exception":"The text is too large: 4294967296 bytes, )"
              R"(at most 1073741824 are accepted","status":false})");
}

TEST_F(TextDocumentReading, AnswersTextWithoutLineEndsWhole) {
    // Text in one piece, in characters of one, two and, in the last, two or four bytes; a detection
    // or conversion that took more than linear time would not come to an end here.
    constexpr std::size_t count = 5'000'000;
    std::string shiftJis;
    std::string utf16("\xFF\xFE", 2);
    for (std::size_t i = 0; i < count / 10; ++i) {
        shiftJis += shiftJisText.substr(0, 10);
        utf16.append("a\0\xE9\0\x3D\xD8\x00\xDE", 8);
    }
    for (const std::string& text : {std::string(count, 'x'), shiftJis}) {
        EXPECT_TRUE(service.readTextFileContent(file(text)) == text);
    }
    EXPECT_TRUE(service.readTextFileContent(file(utf16)) == utf16.substr(2));
}

TEST_F(TextDocumentReading, DoesNotWaitForAFileOfTheSystemToTellSomething) {
    // Reading it waits for the kernel's next message.
    const int log = ::open("/proc/kmsg", O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (log < 0) {
        GTEST_SKIP() << "this user may not read the messages of the kernel";
    }
    // What is there already is gone with this, so that there is something to wait for.
    std::string messages(1 << 20, '\0');
    while (::read(log, messages.data(), messages.size()) > 0) {
    }
    ::close(log);
    EXPECT_NE(resultOf(u"/proc/kmsg").find("The file cannot be read"), std::string::npos);
}

TEST_F(TextDocumentReading, AnswersWhatStoppedTheReadingHalfWay) {
    // A file that the system lists but cannot read from its start: the memory of this process.
    const std::string result = resultOf(u"/proc/self/mem");
    EXPECT_NE(result.find(R"("exception":)"), std::string::npos) << result;
    EXPECT_NE(result.find(R"("status":false)"), std::string::npos) << result;
    EXPECT_EQ(result.find("data"), std::string::npos) << result;
}

}  // namespace
}  // namespace EditorServices
