// SPDX-License-Identifier: Apache-2.0
#include "platform/package/quillet_file_writer.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <linux/fs.h>
#include <openssl/evp.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <functional>
#include <optional>
#include <random>
#include <sstream>
#include <stdexcept>

#include "platform/package/quillet_file_reader.h"
#include "platform/package/zip/archive.h"
#include "platform/package/zip/limits.h"
#include "tests/platform/package/package_test_support.h"
#include "tests/support/source_root.h"

namespace test {
namespace {

namespace zip = platform::package::zip;
using platform::package::QuilletFileReader;
using platform::package::QuilletFileWriter;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::ThrowsMessage;

QuilletFilePackage packageOf(std::vector<Part> parts,
                             std::vector<Relationship> relationships = {}) {
    return {parts, relationships};
}

Part part(std::u16string name, const std::string& content = "content",
          std::u16string type = u"text/plain", std::vector<Relationship> relationships = {}) {
    return {bytesOf(content), std::move(type), std::move(name), std::move(relationships)};
}

std::u16string numbered(std::u16string_view text, std::size_t number) {
    return std::u16string(text).append(platform::i18n::to_ustring(std::to_string(number)));
}

void save(const std::u16string& path, const QuilletFilePackage& package) {
    QuilletFileWriter writer(path, {});
    writer.write(package);
    writer.close(false);
}

/// The output of describe_package.py.
std::string description(const std::filesystem::path& path) {
    const std::string command = "python3 '" + test::sourceRoot() +
                                "/tests/platform/package/describe_package.py' '" + path.string() +
                                "'";
    FILE* pipe = ::popen(command.c_str(), "r");
    std::string output;
    for (int c = std::fgetc(pipe); c != EOF; c = std::fgetc(pipe)) {
        output += static_cast<char>(c);
    }
    EXPECT_EQ(::pclose(pipe), 0) << command;
    return output;
}

std::string sha256(const std::vector<std::uint8_t>& bytes) {
    std::array<unsigned char, 32> digest{};
    EVP_Digest(bytes.data(), bytes.size(), digest.data(), nullptr, EVP_sha256(), nullptr);
    std::string hex;
    for (const unsigned char byte : digest) {
        constexpr std::string_view digits = "0123456789abcdef";
        hex += digits[byte >> 4U];
        hex += digits[byte & 15U];
    }
    return hex;
}

class QuilletFileWriterTest : public testing::Test {
protected:
    std::filesystem::path pathOf(const std::string& name) const { return folder_.path() / name; }

    struct stat statusOf(const std::string& name) const {
        struct stat status {};
        EXPECT_EQ(::stat(pathOf(name).c_str(), &status), 0);
        return status;
    }

    mode_t modeOf(const std::string& name) const { return statusOf(name).st_mode & 07777U; }

    QuilletFilePackage saveAndRead(const QuilletFilePackage& package) {
        save(folder_.at("a.docx"), package);
        return QuilletFileReader(folder_.at("a.docx")).read();
    }

    // What the archive holds under `entry`.
    std::string entryOf(const std::string& file, const std::string& name) {
        zip::Archive archive(pathOf(file).string());
        for (const zip::Archive::Entry& entry : archive.entries()) {
            if (entry.name == name) {
                std::vector<std::uint8_t> out(entry.size);
                archive.read(entry, out);
                return textOf(out);
            }
        }
        return "no such entry";
    }

    void expectRefused(const QuilletFilePackage& package, const std::string& message) {
        folder_.file("a.docx", "old");
        EXPECT_THAT(
            [&] { save(folder_.at("a.docx"), package); },
            ThrowsMessage<std::runtime_error>(AllOf(HasSubstr("a.docx"), HasSubstr(message))));
        EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
        EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
    }

    void expectRefusedTarget(const std::string& name, const std::string& message) {
        const std::set<std::string> before = folder_.names();
        EXPECT_THAT([&] { save(folder_.at(name), packageOf({part(u"/a.txt")})); },
                    ThrowsMessage<std::runtime_error>(HasSubstr(message)));
        EXPECT_EQ(folder_.names(), before);
    }

    static std::string thrownBy(const std::function<void()>& work) {
        try {
            work();
            return "nothing thrown";
        } catch (const std::exception& error) {
            return error.what();
        }
    }

    // Runs `work` as an ordinary user, in a process of its own if this one is root's, and returns
    // what it threw.
    std::string thrownAsUser(const std::function<void()>& work) {
        if (::geteuid() != 0) {
            return thrownBy(work);
        }
        std::array<int, 2> ends{};
        EXPECT_EQ(::pipe(ends.data()), 0);
        const pid_t child = ::fork();
        if (child == 0) {
            if (::setgroups(0, nullptr) != 0 || ::setresgid(65534, 65534, 65534) != 0 ||
                ::setresuid(65534, 65534, 65534) != 0) {
                ::_exit(2);
            }
            const std::string text = thrownBy(work);
            ::_exit(::write(ends[1], text.data(), text.size()) < 0 ? 3 : 0);
        }
        ::close(ends[1]);
        std::string text;
        std::array<char, 4096> buffer{};
        for (ssize_t n = 0; (n = ::read(ends[0], buffer.data(), buffer.size())) > 0;) {
            text.append(buffer.data(), static_cast<std::size_t>(n));
        }
        ::close(ends[0]);
        int status = 0;
        ::waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
        return text;
    }

    TemporaryFolder folder_;
};

TEST_F(QuilletFileWriterTest, WritesWhatTheReaderReadsBack) {
    const auto package =
        saveAndRead(packageOf({part(u"/word/document.xml", "<d/>", u"application/doc+xml",
                                    {{u"urn:image", u"media/a.png", u"rId1", 1},
                                     {u"urn:link", u"http://x/?a&b", u"rId2", 0}}),
                               part(u"/word/media/a.png", "png", u"image/png")},
                              {{u"urn:doc", u"word/document.xml", u"rId1", 1}}));
    ASSERT_EQ(package.parts().size(), 2U);
    EXPECT_EQ(package.parts()[0].partUri, u"/word/document.xml");
    EXPECT_EQ(package.parts()[0].contentType, u"application/doc+xml");
    EXPECT_EQ(textOf(package.parts()[0].content), "<d/>");
    ASSERT_EQ(package.parts()[0].relationships.size(), 2U);
    EXPECT_EQ(package.parts()[0].relationships[0].targetMode, 1);
    EXPECT_EQ(package.parts()[0].relationships[1].target, u"http://x/?a&b");
    EXPECT_EQ(package.parts()[0].relationships[1].targetMode, 0);
    EXPECT_EQ(package.parts()[1].contentType, u"image/png");
    EXPECT_EQ(package.relationships().at(0).relationshipType, u"urn:doc");
}

TEST_F(QuilletFileWriterTest, WritesAnEmptyPackage) {
    const auto package = saveAndRead(packageOf({}));
    EXPECT_THAT(package.parts(), IsEmpty());
    EXPECT_THAT(package.relationships(), IsEmpty());
}

TEST_F(QuilletFileWriterTest, TouchesNothingOnDiskUntilItWrites) {
    QuilletFileWriter writer(folder_.at("a.docx"), {});
    EXPECT_THAT(folder_.names(), IsEmpty());
    writer.close(false);
    EXPECT_THAT(folder_.names(), IsEmpty());
}

TEST_F(QuilletFileWriterTest, ReplacesTheTargetOnlyWhenItIsClosed) {
    folder_.file("a.docx", "old");
    QuilletFileWriter writer(folder_.at("a.docx"), {});
    writer.write(packageOf({part(u"/a.txt")}));
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    writer.close(false);
    EXPECT_EQ(QuilletFileReader(folder_.at("a.docx")).read().parts().size(), 1U);
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
    const std::string bytes = folder_.bytesOf("a.docx");
    writer.close(false);
    EXPECT_EQ(folder_.bytesOf("a.docx"), bytes);
}

TEST_F(QuilletFileWriterTest, DropsWhatItWroteWhenToldTo) {
    folder_.file("a.docx", "old");
    QuilletFileWriter writer(folder_.at("a.docx"), {});
    writer.write(packageOf({part(u"/a.txt")}));
    writer.close(true);
    writer.close(false);
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, DropsWhatItWroteWhenItIsDestroyedWithoutClose) {
    folder_.file("a.docx", "old");
    {
        QuilletFileWriter writer(folder_.at("a.docx"), {});
        writer.write(packageOf({part(u"/a.txt")}));
    }
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, KeepsTheLastOfSeveralWrites) {
    QuilletFileWriter writer(folder_.at("a.docx"), {});
    writer.write(packageOf({part(u"/a.txt")}));
    writer.write(packageOf({part(u"/b.txt")}));
    writer.close(false);
    EXPECT_EQ(QuilletFileReader(folder_.at("a.docx")).read().parts().at(0).partUri, u"/b.txt");
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, KeepsNothingWhenTheLastWriteFailed) {
    QuilletFileWriter writer(folder_.at("a.docx"), {});
    writer.write(packageOf({part(u"/a.txt")}));
    EXPECT_THROW(writer.write(packageOf({part(u"a")})), std::runtime_error);
    writer.close(false);
    EXPECT_THAT(folder_.names(), IsEmpty());
}

TEST_F(QuilletFileWriterTest, OrdersTheArchiveTheSameWayAlways) {
    save(folder_.at("a.docx"),
         packageOf(
             {part(u"/b.txt", "b", u"text/plain", {{u"t", u"a.txt", u"r", 1}}), part(u"/a.txt")},
             {{u"t", u"a.txt", u"r", 1}}));
    std::vector<std::string> names;
    const zip::Archive archive(pathOf("a.docx").string());
    for (const auto& entry : archive.entries()) {
        names.push_back(entry.name);
    }
    EXPECT_THAT(names, ElementsAre("[Content_Types].xml", "_rels/.rels", "b.txt",
                                   "_rels/b.txt.rels", "a.txt"));
}

TEST_F(QuilletFileWriterTest, WritesEqualBytesForEqualPackages) {
    const auto package = packageOf({part(u"/b.txt", std::string(100'000, 'b')), part(u"/a.png")},
                                   {{u"t", u"a.txt", u"r", 1}});
    save(folder_.at("a.docx"), package);
    save(folder_.at("b.docx"), package);
    EXPECT_EQ(folder_.bytesOf("a.docx"), folder_.bytesOf("b.docx"));
}

TEST_F(QuilletFileWriterTest, TakesOverWhatThePreviousArchiveHasOfTheSameContent) {
    std::string text;
    for (int i = 0; i < 1000; ++i) {
        text += std::to_string(i * i) + " ";
    }
    const std::string byAnother = deflate(text, 1);
    save(folder_.at("new.docx"), packageOf({part(u"/a.txt", text)}));
    ASSERT_THAT(folder_.bytesOf("new.docx"), Not(HasSubstr(byAnother)));

    ZipEntry same{"a.txt", byAnother};
    same.method = 8;
    same.size = text.size();
    same.checksum = checksum(text);
    ZipEntry changed = same;
    changed.name = "b.txt";
    folder_.file("a.docx", usualPackage({same, changed}));
    save(folder_.at("a.docx"),
         packageOf({part(u"/a.txt", text), part(u"/b.txt", text + "changed")}));
    EXPECT_THAT(folder_.bytesOf("a.docx"), HasSubstr("a.txt" + byAnother));
    EXPECT_THAT(folder_.bytesOf("a.docx"), Not(HasSubstr("b.txt" + byAnother)));
    EXPECT_EQ(entryOf("a.docx", "a.txt"), text);
    EXPECT_EQ(entryOf("a.docx", "b.txt"), text + "changed");
}

TEST_F(QuilletFileWriterTest, WritesEqualBytesForEqualPackagesOverEqualArchives) {
    const QuilletFilePackage package = packageOf(
        {part(u"/a.txt", std::string(5000, 'a') + "b"), part(u"/c.txt", std::string(50, 'c'))});
    const std::string previous = usualPackage({{"c.txt", std::string(50, 'c'), true}});
    folder_.file("a.docx", previous);
    folder_.file("b.docx", previous);
    save(folder_.at("a.docx"), package);
    save(folder_.at("b.docx"), package);
    EXPECT_EQ(folder_.bytesOf("a.docx"), folder_.bytesOf("b.docx"));
    save(folder_.at("a.docx"), package);
    EXPECT_EQ(folder_.bytesOf("a.docx"), folder_.bytesOf("b.docx"));
}

TEST_F(QuilletFileWriterTest, WritesWhatItIsGivenOverAnyDamagedArchive) {
    std::mt19937 random(3);
    const QuilletFilePackage package =
        packageOf({part(u"/a.txt", std::string(3000, 'a') + "b"),
                   part(u"/c.txt", std::string(2000, 'c') + "d"),
                   part(u"/d.png", std::string(1000, 'e') + "f", u"image/png")});
    save(folder_.at("whole.docx"), package);
    const std::string whole = folder_.bytesOf("whole.docx");
    for (int run = 0; run < 150; ++run) {
        std::string damaged = whole;
        for (int i = 0; i < 3; ++i) {
            damaged[random() % damaged.size()] = static_cast<char>(random());
        }
        damaged.resize(damaged.size() - (run % 5 == 0 ? random() % damaged.size() : 0));
        folder_.file("a.docx", damaged);
        const QuilletFilePackage read = saveAndRead(package);
        ASSERT_EQ(read.parts().size(), package.parts().size());
        for (std::size_t i = 0; i < read.parts().size(); ++i) {
            ASSERT_EQ(read.parts()[i].content, package.parts()[i].content);
        }
    }
}

TEST_F(QuilletFileWriterTest, StoresTheTopLevelTypeInLowerCase) {
    const auto package = saveAndRead(packageOf(
        {part(u"/a.bin", "\xFF", u"Application/vnd.X; Y=Z"), part(u"/b.bin", "", u"NoSlash")}));
    EXPECT_EQ(package.parts()[0].contentType, u"application/vnd.X; Y=Z");
    EXPECT_EQ(package.parts()[1].contentType, u"noslash");
    EXPECT_EQ(textOf(package.parts()[0].content), "\xFF");
}

TEST_F(QuilletFileWriterTest, WritesARelationshipAsExternalWhenItsFlagOrItsTargetSaysSo) {
    const auto modeOfTarget = [&](std::u16string target, std::uint8_t mode) {
        const auto package = saveAndRead(packageOf(
            {part(u"/w/a.txt", "", u"text/plain", {{u"t", std::move(target), u"r", mode}}),
             part(u"/w/M\u00E9.png")}));
        return package.parts().at(0).relationships.at(0).targetMode;
    };
    for (const char16_t* target : {u"M\u00E9.png", u"m%C3%A9.PNG", u"/w/M\u00E9.png", u"../w/a.txt",
                                   u"a.txt#here", u"#here", u"", u"..\\w\\a.txt"}) {
        EXPECT_EQ(modeOfTarget(target, 1), 1) << platform::i18n::to_string(target);
        EXPECT_EQ(modeOfTarget(target, 0), 0) << platform::i18n::to_string(target);
    }
    for (const char16_t* target :
         {u"http://example.org/w/a.txt", u"mailto:a@b", u"gone.txt", u"NULL", u"//host/w/a.txt",
          u"C:\\w\\a.txt", u"/", u"_rels/a.txt.rels"}) {
        EXPECT_EQ(modeOfTarget(target, 1), 0) << platform::i18n::to_string(target);
    }
}

// Which of both a link without a path is, nothing but the file says.
TEST_F(QuilletFileWriterTest, KeepsLinksWithoutAPathExternalWhereTheyAre) {
    const auto saved = [&](std::vector<Relationship> links) {
        const auto package = saveAndRead(
            packageOf({part(u"/w/a.txt", "", u"text/plain", std::move(links)), part(u"/w/b.txt")}));
        std::vector<int> modes;
        for (const Relationship& link : package.parts().at(0).relationships) {
            modes.push_back(link.targetMode);
        }
        return modes;
    };
    EXPECT_THAT(saved({{u"t", u"#x", u"r1", 0},
                       {u"t", u"", u"r2", 0},
                       {u"t", u"?q", u"r3", 0},
                       {u"t", u"#x", u"r4", 1},
                       {u"t", u"b.txt", u"r5", 0}}),
                ElementsAre(0, 0, 0, 1, 0));
    EXPECT_THAT(saved({{u"t", u"#x", u"r1", 1},
                       {u"t", u"", u"r2", 1},
                       {u"t", u"?q", u"r3", 1},
                       {u"t", u"#x", u"r4", 1},
                       {u"t", u"b.txt", u"r5", 1}}),
                ElementsAre(0, 0, 0, 1, 1));
    EXPECT_THAT(
        saved(
            {{u"other", u"#x", u"r1", 1}, {u"t", u"#other", u"r2", 1}, {u"t", u"?q", u"other", 1}}),
        ElementsAre(1, 1, 1));
    std::filesystem::remove(pathOf("a.docx"));
    EXPECT_THAT(saved({{u"t", u"#x", u"r1", 1}}), ElementsAre(1));
}

TEST_F(QuilletFileWriterTest, WritesPackageRelationshipsToNoPartAsExternal) {
    const auto package = saveAndRead(packageOf(
        {part(u"/a.txt")},
        {{u"t", u"a.txt", u"r1", 1}, {u"t", u"b.txt", u"r2", 1}, {u"t", u"#x", u"r3", 1}}));
    EXPECT_EQ(package.relationships().at(0).targetMode, 1);
    EXPECT_EQ(package.relationships().at(1).targetMode, 0);
    EXPECT_EQ(package.relationships().at(2).targetMode, 0);
}

TEST_F(QuilletFileWriterTest, KeepsEveryTextThatXmlCanHold) {
    const std::u16string text = u"<>&\"' \t\r\n\u00E9\u4E2D\xD83D\xDE00\u0085\u2028";
    const auto package =
        saveAndRead(packageOf({part(u"/a.txt", "", u"a/b" + text)}, {{text, text, text, 0}}));
    EXPECT_EQ(package.parts().at(0).contentType, u"a/b" + text);
    EXPECT_EQ(package.relationships().at(0).relationshipId, text);
    EXPECT_EQ(package.relationships().at(0).relationshipType, text);
    EXPECT_EQ(package.relationships().at(0).target, text);
}

TEST_F(QuilletFileWriterTest, RefusesPartsThatCouldNotBeReadBack) {
    const auto refused = [&](std::u16string name, const std::string& message) {
        expectRefused(packageOf({part(std::move(name))}), message);
    };
    refused(u"", "has an invalid name: it does not begin with a slash");
    refused(u"a.txt", "part \"a.txt\" has an invalid name: it does not begin with a slash");
    refused(u"/a/", "empty segment");
    refused(u"/a/../b", "ends with a dot");
    refused(u"/a\\b", "characters ? #");
    refused(u"/a%2fb", "escaped slash");
    refused(std::u16string(u"/a\0b", 4), "control character");
    refused(u"/[content_types].XML", "reserved for the content types");
    refused(u"/%5Bcontent_types].xml", "reserved for the content types");
    refused(u"/_rels/.rels", "reserved for relationships");
    refused(u"/word/_rels/document.xml.rels", "reserved for relationships");
    refused(u"/a/[0].piece", "reserved for pieces");
    refused(u"/[trash]/a.txt", "the trash");
    refused(u"/\xD800", "part \"/\xEF\xBF\xBD\" Cannot encode text as UTF-8: unpaired surrogate");
    refused(std::u16string(u"/").append(70'000, u'a'), "too long a name");
    refused(u"/a\uFFFF", "part \"/a\uFFFF\" has a character that XML cannot hold");
    expectRefused(packageOf({part(u"/a.txt"), part(u"/A.TXT")}),
                  "part \"/A.TXT\" has the name of another part");
    expectRefused(packageOf({part(u"/a b"), part(u"/a%20b")}), "has the name of another part");
    expectRefused(packageOf({part(u"/a", "", u"")}), "part \"/a\" has no content type");
    expectRefused(packageOf({part(u"/a", "", u"a/\u0001")}),
                  "part \"/a\" has a character that XML cannot hold");
}

TEST_F(QuilletFileWriterTest, RefusesRelationshipsThatCouldNotBeReadBack) {
    const auto refused = [&](std::vector<Relationship> relationships, const std::string& message) {
        expectRefused(packageOf({part(u"/a.txt", "", u"text/plain", relationships)}),
                      "part \"/a.txt\" " + message);
        expectRefused(packageOf({}, relationships), message);
    };
    refused({{u"t", u"x", u"", 1}}, "has a relationship without an id");
    refused({{u"", u"x", u"r", 1}}, "has a relationship \"r\" without a type");
    refused({{u"t", u"x", u"r", 1}, {u"t", u"y", u"r", 1}},
            "has two relationships of the id \"r\"");
    refused({{u"t", u"\u0007", u"r", 1}}, "has a character that XML cannot hold");
    refused({{u"t", u"\xDC00", u"r", 1}}, "Cannot encode text as UTF-8: unpaired surrogate");
}

TEST_F(QuilletFileWriterTest, RefusesMoreThanReadersAccept) {
    std::vector<Part> parts;
    for (std::size_t i = 0; i < zip::maxEntries; ++i) {
        parts.push_back({{}, u"a/b", numbered(u"/", i), {}});
    }
    expectRefused(packageOf(parts), "has one part too many");
    parts.pop_back();
    EXPECT_EQ(saveAndRead(packageOf(parts)).parts().size(), zip::maxEntries - 1);
}

TEST_F(QuilletFileWriterTest, WritesCreatorAndTitleIntoTheCoreProperties) {
    QuilletFileWriter writer(folder_.at("a.docx"), {u"A & B", u"<T>"});
    writer.write(packageOf({part(u"/a.txt")}, {{u"t", u"a.txt", u"rIdCore", 1}}));
    writer.close(false);
    const auto package = QuilletFileReader(folder_.at("a.docx")).read();
    ASSERT_EQ(package.parts().size(), 2U);
    EXPECT_EQ(package.parts()[1].partUri, u"/docProps/core.xml");
    EXPECT_EQ(package.parts()[1].contentType,
              u"application/vnd.openxmlformats-package.core-properties+xml");
    EXPECT_THAT(textOf(package.parts()[1].content),
                AllOf(HasSubstr("<dc:creator>A &amp; B</dc:creator>"),
                      HasSubstr("<dc:title>&lt;T&gt;</dc:title>")));
    ASSERT_EQ(package.relationships().size(), 2U);
    EXPECT_EQ(package.relationships()[1].targetMode, 1);
    EXPECT_EQ(package.relationships()[1].target, u"/docProps/core.xml");
    EXPECT_NE(package.relationships()[1].relationshipId, u"rIdCore");
}

TEST_F(QuilletFileWriterTest, RefusesASecondSetOfCoreProperties) {
    const auto expectConflict = [&](const QuilletFilePackage& package, const std::string& message) {
        QuilletFileWriter writer(folder_.at("a.docx"), {u"", u"T"});
        EXPECT_THAT([&] { writer.write(package); },
                    ThrowsMessage<std::runtime_error>(HasSubstr(message)));
    };
    expectConflict(packageOf({}, {{u"http://schemas.openxmlformats.org/package/2006/relationships/"
                                   u"metadata/core-properties",
                                   u"x", u"r", 1}}),
                   "has core properties already");
    expectConflict(packageOf({part(u"/docprops/CORE.xml")}), "has the name of another part");
}

TEST_F(QuilletFileWriterTest, StoresWhatDoesNotGetSmaller) {
    std::mt19937 random(3);
    std::string noise(300'000, '\0');
    for (char& c : noise) {
        c = static_cast<char>(random());
    }
    const std::string text = [] {
        std::string result;
        for (int i = 0; i < 20'000; ++i) {
            result += "line " + std::to_string(i * 7919) + "\n";
        }
        return result;
    }();
    save(folder_.at("a.docx"),
         packageOf({part(u"/text.txt", text), part(u"/noise.bin", noise, u"a/b"),
                    part(u"/small.bin", noise.substr(0, 100), u"a/b"), part(u"/empty.txt", ""),
                    part(u"/image.png", text, u"image/PNG; x=y"),
                    part(u"/pic.jpg", text, u"image/jpeg"),
                    part(u"/vector.svg", text, u"image/svg+xml"),
                    part(u"/blank.txt", std::string(1'000'000, ' '))}));
    const zip::Archive archive(pathOf("a.docx").string());
    const auto methodOf = [&](const std::string& name) {
        for (const auto& entry : archive.entries()) {
            if (entry.name == name) {
                return entry.method;
            }
        }
        return std::uint16_t{0xFFFF};
    };
    EXPECT_EQ(methodOf("text.txt"), 8);
    EXPECT_EQ(methodOf("vector.svg"), 8);
    EXPECT_EQ(methodOf("noise.bin"), 0);
    EXPECT_EQ(methodOf("small.bin"), 0);
    EXPECT_EQ(methodOf("empty.txt"), 0);
    EXPECT_EQ(methodOf("pic.jpg"), 0);
    EXPECT_EQ(methodOf("image.png"), 0);
    EXPECT_EQ(methodOf("blank.txt"), 0) << "deflated, readers would take it for a bomb";
}

TEST_F(QuilletFileWriterTest, WritesAHundredMegabytesOfBlanksSoThatTheyCanBeRead) {
    const std::string blanks(100 << 20, ' ');
    EXPECT_EQ(textOf(saveAndRead(packageOf({part(u"/a.txt", blanks)})).parts().at(0).content),
              blanks);
}

// Parts with random names, types, contents and relationships, for the tests below.
class PackageGenerator {
public:
    explicit PackageGenerator(std::uint32_t seed) : random_(seed) {}

    QuilletFilePackage package() {
        std::vector<Part> parts(number(12));
        for (std::size_t i = 0; i < parts.size(); ++i) {
            parts[i].partUri = name(i);
            parts[i].contentType = pick({u"text/plain", u"image/png", u"application/xml",
                                         u"application/x+xml", u"a/b; charset=\"utf-8\""});
            parts[i].content = content();
        }
        for (Part& each : parts) {
            each.relationships = relationships(parts);
        }
        std::vector<Relationship> ofPackage = relationships(parts);
        return {parts, ofPackage};
    }

private:
    std::size_t number(std::size_t bound) { return random_() % bound; }

    std::u16string pick(std::initializer_list<const char16_t*> choices) {
        return *(choices.begin() + number(choices.size()));
    }

    std::u16string name(std::size_t index) {
        std::u16string result =
            pick({u"/", u"/word/", u"/xl/work sheets/", u"/m%C3%A9dia/", u"/\u56FE/"});
        result += pick({u"a", u"B", u"\u00E9", u"x y", u"(1)", u"%41"});
        result += platform::i18n::to_ustring(std::to_string(index));
        return result + pick({u"", u".xml", u".XML", u".png", u".bin", u".\u00E9"});
    }

    std::vector<std::uint8_t> content() {
        std::vector<std::uint8_t> bytes(number(2) == 0 ? number(50) : number(400'000));
        const std::size_t alphabet = 1 + number(256);
        for (std::uint8_t& byte : bytes) {
            byte = static_cast<std::uint8_t>(number(alphabet));
        }
        return bytes;
    }

    std::vector<Relationship> relationships(const std::vector<Part>& parts) {
        std::vector<Relationship> result(number(4));
        for (std::size_t i = 0; i < result.size(); ++i) {
            result[i].relationshipId = numbered(u"rId", i);
            result[i].relationshipType = pick({u"urn:a", u"http://x/<&>"});
            const bool isInternal = !parts.empty() && number(2) == 0;
            result[i].target = isInternal
                                   ? parts[number(parts.size())].partUri
                                   : pick({u"http://x/?a&b=\u00E9", u"mailto:a@b", u"gone.xml"});
            result[i].targetMode = isInternal ? 1 : 0;
        }
        return result;
    }

    std::mt19937 random_;
};

void expectEqual(const std::vector<Relationship>& a, const std::vector<Relationship>& b) {
    ASSERT_EQ(a.size(), b.size());
    for (std::size_t i = 0; i < a.size(); ++i) {
        EXPECT_EQ(a[i].relationshipId, b[i].relationshipId);
        EXPECT_EQ(a[i].relationshipType, b[i].relationshipType);
        EXPECT_EQ(a[i].target, b[i].target);
        EXPECT_EQ(a[i].targetMode, b[i].targetMode);
    }
}

TEST_F(QuilletFileWriterTest, ReadsBackEveryGeneratedPackage) {
    for (std::uint32_t seed = 0; seed < 100; ++seed) {
        SCOPED_TRACE(seed);
        const auto package = PackageGenerator(seed).package();
        const auto again = saveAndRead(package);
        ASSERT_EQ(again.parts().size(), package.parts().size());
        expectEqual(again.relationships(), package.relationships());
        for (std::size_t i = 0; i < package.parts().size(); ++i) {
            EXPECT_EQ(again.parts()[i].partUri, package.parts()[i].partUri);
            EXPECT_EQ(again.parts()[i].contentType, package.parts()[i].contentType);
            EXPECT_EQ(again.parts()[i].content, package.parts()[i].content);
            expectEqual(again.parts()[i].relationships, package.parts()[i].relationships);
        }
    }
}

// What describe_package.py has to say about the parts and relationships of `package`.
void describeRelationships(std::ostream& out, const std::vector<Relationship>& relationships) {
    using platform::i18n::to_string;
    for (const Relationship& r : relationships) {
        out << "relationship " << to_string(r.relationshipId) << ' '
            << to_string(r.relationshipType) << (r.targetMode == 0 ? " External " : " Internal ")
            << to_string(r.target) << '\n';
    }
}

TEST_F(QuilletFileWriterTest, WritesWhatAnIndependentReaderFinds) {
    for (std::uint32_t seed = 0; seed < 10; ++seed) {
        SCOPED_TRACE(seed);
        const auto package = PackageGenerator(seed).package();
        save(folder_.at("a.docx"), package);
        std::istringstream lines(description(pathOf("a.docx")));
        std::ostringstream found;
        for (std::string line; std::getline(lines, line);) {
            // Relationships parts are compared by their content, below, and not by their bytes.
            const bool isPackageXml = line.find(".rels ") != std::string::npos ||
                                      line.find("[Content_Types]") != std::string::npos ||
                                      line.find("package.relationships+xml") != std::string::npos;
            found << (isPackageXml ? "" : line + "\n");
        }
        std::ostringstream expected;
        describeRelationships(expected, package.relationships());
        for (const Part& each : package.parts()) {
            using platform::i18n::to_string;
            expected << "entry " << to_string(each.partUri) << ' ' << sha256(each.content) << '\n';
            expected << "type " << to_string(each.contentType) << '\n';
            describeRelationships(expected, each.relationships);
        }
        EXPECT_EQ(found.str(), expected.str());
    }
}

TEST_F(QuilletFileWriterTest, GivesANewFileTheUsualPermissions) {
    for (const mode_t mask : {022U, 077U, 002U, 0U}) {
        std::filesystem::remove(pathOf("a.docx"));
        const mode_t before = ::umask(mask);
        save(folder_.at("a.docx"), packageOf({}));
        ::umask(before);
        EXPECT_EQ(modeOf("a.docx"), 0666U & ~mask);
    }
}

TEST_F(QuilletFileWriterTest, KeepsThePermissionsOfTheTarget) {
    for (const mode_t mode : {0600U, 0640U, 0664U, 0666U, 0755U, 0200U, 01644U}) {
        folder_.file("a.docx", "old");
        ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), mode), 0);
        save(folder_.at("a.docx"), packageOf({}));
        EXPECT_EQ(modeOf("a.docx"), mode);
        std::filesystem::remove(pathOf("a.docx"));
    }
}

TEST_F(QuilletFileWriterTest, KeepsTheOwnerOfTheTarget) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only root may give files away";
    }
    folder_.file("a.docx", "old");
    ASSERT_EQ(::chown(pathOf("a.docx").c_str(), 1234, 5678), 0);
    ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), 0640), 0);
    save(folder_.at("a.docx"), packageOf({}));
    EXPECT_EQ(statusOf("a.docx").st_uid, 1234U);
    EXPECT_EQ(statusOf("a.docx").st_gid, 5678U);
    EXPECT_EQ(modeOf("a.docx"), 0640U);
}

TEST_F(QuilletFileWriterTest, GivesNobodyMoreWhenItCannotKeepTheOwner) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only root can become another user";
    }
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0777), 0);
    for (const auto& [before, after] : {std::pair{0666U, 0666U}, std::pair{0676U, 0666U},
                                        std::pair{0626U, 0626U}, std::pair{06762U, 0722U}}) {
        folder_.file("a.docx", "old");
        ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), before), 0);
        EXPECT_EQ(thrownAsUser([&] { save(folder_.at("a.docx"), packageOf({})); }),
                  "nothing thrown");
        EXPECT_EQ(statusOf("a.docx").st_uid, 65534U);
        EXPECT_EQ(modeOf("a.docx"), after);
        std::filesystem::remove(pathOf("a.docx"));
    }
}

TEST_F(QuilletFileWriterTest, RefusesATargetThatMayNotBeWritten) {
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0777), 0);
    folder_.file("a.docx", "old");
    ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), 0444), 0);
    EXPECT_THAT(thrownAsUser([&] { save(folder_.at("a.docx"), packageOf({})); }),
                HasSubstr("a.docx\" may not be written: Permission denied"));
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, RefusesAFolderThatTakesNoFiles) {
    folder_.file("a.docx", "old");
    ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), 0666), 0);
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0555), 0);
    for (const char* name : {"a.docx", "new.docx"}) {
        EXPECT_THAT(thrownAsUser([&] { save(folder_.at(name), packageOf({})); }),
                    HasSubstr("no file can be created in its folder: Permission denied"));
    }
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0700), 0);
}

TEST_F(QuilletFileWriterTest, WritesIntoAFolderThatCannotBeListed) {
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0333), 0);
    EXPECT_EQ(thrownAsUser([&] { save(folder_.at("a.docx"), packageOf({})); }), "nothing thrown");
    ASSERT_EQ(::chmod(folder_.path().c_str(), 0700), 0);
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, RefusesAnImmutableTarget) {
    folder_.file("a.docx", "old");
    const int file = ::open(pathOf("a.docx").c_str(), O_RDONLY | O_CLOEXEC);
    int flags = 0;
    const bool canBeMade = ::ioctl(file, FS_IOC_GETFLAGS, &flags) == 0;
    const int immutable = flags | FS_IMMUTABLE_FL;
    if (!canBeMade || ::ioctl(file, FS_IOC_SETFLAGS, &immutable) != 0) {
        ::close(file);
        GTEST_SKIP() << "this user or file system cannot make files immutable";
    }
    expectRefusedTarget("a.docx", "may not be written: Operation not permitted");
    EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
    EXPECT_EQ(::ioctl(file, FS_IOC_SETFLAGS, &flags), 0);
    ::close(file);
}

TEST_F(QuilletFileWriterTest, RefusesTargetsThatAreNoFiles) {
    ASSERT_EQ(::mkdir(pathOf("folder").c_str(), 0700), 0);
    ASSERT_EQ(::mkfifo(pathOf("pipe").c_str(), 0600), 0);
    ASSERT_EQ(::symlink("/dev/full", pathOf("device").c_str()), 0);
    expectRefusedTarget("folder", "is a folder");
    expectRefusedTarget("folder/", "is a folder");
    expectRefusedTarget("folder/.", "is a folder");
    expectRefusedTarget("pipe", "is not a regular file");
    expectRefusedTarget("device", "is not a regular file");
    expectRefusedTarget("none/a.docx", "its folder cannot be opened: No such file");
    expectRefusedTarget("pipe/a.docx", "Not a directory");
    EXPECT_THAT([] { save(u"", packageOf({})); },
                ThrowsMessage<std::runtime_error>(HasSubstr("has no name")));
    EXPECT_THROW(save(u"\xD800", packageOf({})), std::runtime_error);
}

TEST_F(QuilletFileWriterTest, FollowsSymbolicLinksToTheFile) {
    ASSERT_EQ(::mkdir(pathOf("folder").c_str(), 0700), 0);
    folder_.file("folder/real.docx", "old");
    ASSERT_EQ(::symlink("real.docx", pathOf("folder/inner").c_str()), 0);
    ASSERT_EQ(::symlink("folder/inner", pathOf("outer").c_str()), 0);
    ASSERT_EQ(::symlink(pathOf("outer").c_str(), pathOf("absolute").c_str()), 0);
    save(folder_.at("absolute"), packageOf({part(u"/a.txt")}));
    EXPECT_TRUE(std::filesystem::is_symlink(pathOf("outer")));
    EXPECT_TRUE(std::filesystem::is_symlink(pathOf("folder/inner")));
    EXPECT_FALSE(std::filesystem::is_symlink(pathOf("folder/real.docx")));
    EXPECT_EQ(QuilletFileReader(folder_.at("folder/real.docx")).read().parts().size(), 1U);
    EXPECT_THAT(folder_.names(), ElementsAre("absolute", "folder", "outer"));
}

TEST_F(QuilletFileWriterTest, CreatesTheTargetOfADanglingLink) {
    ASSERT_EQ(::symlink("new.docx", pathOf("link").c_str()), 0);
    save(folder_.at("link"), packageOf({}));
    EXPECT_TRUE(std::filesystem::is_symlink(pathOf("link")));
    EXPECT_THAT(folder_.names(), ElementsAre("link", "new.docx"));
}

TEST_F(QuilletFileWriterTest, RefusesLinksThatLeadInACircle) {
    ASSERT_EQ(::symlink("b", pathOf("a").c_str()), 0);
    ASSERT_EQ(::symlink("a", pathOf("b").c_str()), 0);
    expectRefusedTarget("a", "cannot be found");
}

TEST_F(QuilletFileWriterTest, KeepsExtendedAttributes) {
    folder_.file("a.docx", "old");
    if (::setxattr(pathOf("a.docx").c_str(), "user.origin", "there", 5, 0) != 0) {
        GTEST_SKIP() << "this file system has no extended attributes";
    }
    save(folder_.at("a.docx"), packageOf({}));
    std::array<char, 16> value{};
    EXPECT_EQ(::getxattr(pathOf("a.docx").c_str(), "user.origin", value.data(), value.size()), 5);
    EXPECT_STREQ(value.data(), "there");
}

// An access control list in the form in which the kernel takes it: user::rw-, user:1234:rw-,
// group::---, mask::rw-, other::---.
std::string accessControlList() {
    constexpr std::uint64_t none = 0xFFFFFFFF;
    return bytes32(2) + bytes16(0x01) + bytes16(6) + bytes32(none) + bytes16(0x02) + bytes16(6) +
           bytes32(1234) + bytes16(0x04) + bytes16(0) + bytes32(none) + bytes16(0x10) + bytes16(6) +
           bytes32(none) + bytes16(0x20) + bytes16(0) + bytes32(none);
}

TEST_F(QuilletFileWriterTest, KeepsTheAccessControlList) {
    folder_.file("a.docx", "old");
    const std::string list = accessControlList();
    constexpr const char* name = "system.posix_acl_access";
    if (::setxattr(pathOf("a.docx").c_str(), name, list.data(), list.size(), 0) != 0) {
        GTEST_SKIP() << "this file system has no access control lists";
    }
    const mode_t mode = modeOf("a.docx");
    save(folder_.at("a.docx"), packageOf({}));
    std::string found(list.size(), '\0');
    EXPECT_EQ(::getxattr(pathOf("a.docx").c_str(), name, found.data(), found.size()),
              static_cast<ssize_t>(list.size()));
    EXPECT_EQ(found, list);
    EXPECT_EQ(modeOf("a.docx"), mode);
}

TEST_F(QuilletFileWriterTest, DoesNotLetTheFoldersListOpenThePermissionsOfTheTarget) {
    folder_.file("a.docx", "old");
    ASSERT_EQ(::chmod(pathOf("a.docx").c_str(), 0640), 0);
    const std::string list = accessControlList();
    if (::setxattr(folder_.path().c_str(), "system.posix_acl_default", list.data(), list.size(),
                   0) != 0) {
        GTEST_SKIP() << "this file system has no access control lists";
    }
    save(folder_.at("a.docx"), packageOf({}));
    EXPECT_LT(::getxattr(pathOf("a.docx").c_str(), "system.posix_acl_access", nullptr, 0), 0);
    EXPECT_EQ(modeOf("a.docx"), 0640U);
    save(folder_.at("new.docx"), packageOf({}));
    EXPECT_GT(::getxattr(pathOf("new.docx").c_str(), "system.posix_acl_access", nullptr, 0), 0);
}

TEST_F(QuilletFileWriterTest, SavesUnderTheLongestNameThatThereIs) {
    const std::string name(255, 'a');
    save(folder_.at(name), packageOf({}));
    EXPECT_THAT(folder_.names(), ElementsAre(name));
}

TEST_F(QuilletFileWriterTest, SavesUnderARelativePath) {
    const std::filesystem::path before = std::filesystem::current_path();
    std::filesystem::current_path(folder_.path());
    save(u"a.docx", packageOf({}));
    std::filesystem::current_path(before);
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST_F(QuilletFileWriterTest, LeavesOtherHardLinksAlone) {
    folder_.file("a.docx", "old");
    std::filesystem::create_hard_link(pathOf("a.docx"), pathOf("b.docx"));
    save(folder_.at("a.docx"), packageOf({}));
    EXPECT_EQ(folder_.bytesOf("b.docx"), "old");
}

}  // namespace
}  // namespace test
