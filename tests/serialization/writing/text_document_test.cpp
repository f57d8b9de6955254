// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <utility>

#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;
using test::readFile;
using test::writeFile;

class TextDocumentWriting : public testing::Test {
protected:
    bool write(const std::string& text, const std::string& charset) const {
        return service.writeTextDocument(to_ustring(path.string()), text, charset);
    }

    Serialization service;
    test::TemporaryDirectory folder;
    const std::filesystem::path path = folder / "file.txt";
};

TEST_F(TextDocumentWriting, StoresTheTextWithoutAByteOrderMark) {
    EXPECT_TRUE(write("abc", "UTF-8"));
    EXPECT_EQ(readFile(path), "abc");
}

TEST_F(TextDocumentWriting, StoresTheBytesOfTheNamedCharset) {
    const std::string shiftJis = "\x93\xFA\x96\x7B\r\n";
    EXPECT_TRUE(write(shiftJis, "Shift_JIS"));
    EXPECT_EQ(readFile(path), shiftJis);
    const std::string utf16("h\0i\0", 4);
    EXPECT_TRUE(write(utf16, "UTF-16LE"));
    EXPECT_EQ(readFile(path), utf16);
}

TEST_F(TextDocumentWriting, NeitherAddsNorRemovesAByteOrderMark) {
    EXPECT_TRUE(write("\xEF\xBB\xBFtext", "UTF-8"));
    EXPECT_EQ(readFile(path), "\xEF\xBB\xBFtext");
}

TEST_F(TextDocumentWriting, ReplacesALongerFileWhole) {
    writeFile(path, "a much longer text than the new one");
    EXPECT_TRUE(write("short", "UTF-8"));
    EXPECT_EQ(readFile(path), "short");
}

TEST_F(TextDocumentWriting, ReplacesASparseFileOfFourGigabytesWhole) {
    writeFile(path, "old");
    std::filesystem::resize_file(path, std::uintmax_t{1} << 32);
    EXPECT_TRUE(write("short", "UTF-8"));
    EXPECT_EQ(readFile(path), "short");
}

TEST_F(TextDocumentWriting, StoresTextWithoutLineEnds) {
    const std::string text(5'000'000, 'x');
    EXPECT_TRUE(write(text, "UTF-8"));
    EXPECT_TRUE(readFile(path) == text);
    EXPECT_TRUE(write(text, "windows-1252"));
    EXPECT_TRUE(readFile(path) == text);
}

TEST_F(TextDocumentWriting, OfEmptyTextTruncatesTheFile) {
    writeFile(path, "old");
    EXPECT_TRUE(write("", "UTF-8"));
    EXPECT_EQ(readFile(path), "");
}

TEST_F(TextDocumentWriting, InAnUnknownCharsetIsRefusedWithTheFileUntouched) {
    writeFile(path, "old");
    EXPECT_FALSE(write("new", "no-such-charset"));
    EXPECT_FALSE(write("new", ""));
    EXPECT_FALSE(write("", "no-such-charset"));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(TextDocumentWriting, OfTextThatIsNotInTheCharsetIsRefusedWithTheFileUntouched) {
    writeFile(path, "old");
    EXPECT_FALSE(write("caf\xE9", "UTF-8"));
    EXPECT_FALSE(write("caf\xC3\xA9", "US-ASCII"));
    EXPECT_FALSE(write("odd", "UTF-16LE"));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(TextDocumentWriting, OfMalformedHzIsRefusedWithTheFileUntouched) {
    writeFile(path, "KEEP");
    for (const char* malformed : {"~{::W", "~{::\xFF", "~}", "abc~", "~{a", "~{", "~{::", "a~b"}) {
        EXPECT_FALSE(write(malformed, "HZ-GB-2312")) << malformed;
        EXPECT_EQ(readFile(path), "KEEP") << malformed;
    }
}

TEST_F(TextDocumentWriting, OfHzStoresItsBytes) {
    for (const char* text : {"abc", "~~", "~{::~}", "a~{::VW~}~~\n~{::~}\n"}) {
        EXPECT_TRUE(write(text, "HZ-GB-2312")) << text;
        EXPECT_EQ(readFile(path), text);
    }
}

TEST_F(TextDocumentWriting, OfTextThatDecodesAndDoesNotEncodeAgainIsRefusedWithTheFileUntouched) {
    writeFile(path, "KEEP");
    const std::pair<std::string, std::string> texts[] = {
        {"SCSU", std::string("\x0E\xD8\0", 3)},  // half of a surrogate pair
        {"UTF-7", "+2AA-"},                      // the same
        {"UTF-7", "a+"},
        {"UTF-7", "+"},
        {"ISO-2022-JP", "\x1B(IE"},  // a set that is read and not written
        {"EUC-JP", "\x8E\xE0"},
        {"ibm-1250", "\x80"},
        {"BOCU-1", "\x50"},
        {"gsm-03.38-2009", "\x1B"},
    };
    for (const auto& [charset, text] : texts) {
        EXPECT_FALSE(write(text, charset)) << charset << ' ' << text;
        EXPECT_EQ(readFile(path), "KEEP") << charset << ' ' << text;
    }
}

TEST_F(TextDocumentWriting, ToAPathThatCannotBeOpenedIsRefused) {
    EXPECT_FALSE(service.writeTextDocument(to_ustring((folder / "no/such/folder").string()), "text",
                                           "UTF-8"));
    EXPECT_FALSE(service.writeTextDocument(to_ustring(folder.path().string()), "text", "UTF-8"));
    EXPECT_FALSE(service.writeTextDocument(u"", "text", "UTF-8"));
}

TEST_F(TextDocumentWriting, ToAPathWithAZeroIsRefusedAndTouchesNothing) {
    writeFile(path, "old");
    std::u16string cut = to_ustring(path.string());
    cut += u'\0';
    EXPECT_FALSE(service.writeTextDocument(cut, "new", "UTF-8"));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(TextDocumentWriting, ToAPipeIsRefusedRatherThanWaitForAReader) {
    ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    EXPECT_FALSE(service.writeTextDocument(to_ustring(path.string()), "text", "UTF-8"));
}

TEST_F(TextDocumentWriting, IsDoneOnceTheFileCouldBeOpenedWhateverTheDeviceSays) {
    EXPECT_TRUE(service.writeTextDocument(u"/dev/full", std::string(100'000, 'x'), "UTF-8"));
}

TEST_F(TextDocumentWriting, OfTextThatCannotBeEncodedThrowsWithTheFileTruncated) {
    writeFile(path, "old");
    EXPECT_THROW(service.writeTextFileContent(to_ustring(path.string()), u"\u65E5", "ISO-8859-1"),
                 std::runtime_error);
    EXPECT_EQ(readFile(path), "");
}

TEST_F(TextDocumentWriting, OfCodeUnitsStoresThemInTheCharset) {
    EXPECT_TRUE(service.writeTextFileContent(to_ustring(path.string()), u"\u00E9", "ISO-8859-1"));
    EXPECT_EQ(readFile(path), "\xE9");
    EXPECT_TRUE(service.writeTextFileContent(to_ustring(path.string()), u"", "ISO-8859-1"));
    EXPECT_EQ(readFile(path), "");
    EXPECT_FALSE(service.writeTextFileContent(u"", u"x", "ISO-8859-1"));
}

TEST_F(TextDocumentWriting, KeepsTheFilesPermissionsAndItsLinks) {
    writeFile(folder / "target.txt", "old");
    std::filesystem::permissions(folder / "target.txt", std::filesystem::perms(0640));
    std::filesystem::create_symlink(folder / "target.txt", path);
    EXPECT_TRUE(write("new", "UTF-8"));
    EXPECT_TRUE(std::filesystem::is_symlink(path));
    EXPECT_EQ(readFile(folder / "target.txt"), "new");
    EXPECT_EQ(std::filesystem::status(path).permissions(), std::filesystem::perms(0640));
}

}  // namespace
}  // namespace EditorServices
