// SPDX-License-Identifier: Apache-2.0
#include "platform/package/quillet_file_reader.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <stdexcept>
#include <string>

#include "tests/platform/package/package_test_support.h"

namespace test {
namespace {

using platform::package::QuilletFileReader;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::ThrowsMessage;

class QuilletFileReaderTest : public testing::Test {
protected:
    QuilletFilePackage read(const std::string& bytes) {
        return QuilletFileReader(folder_.file("a.docx", bytes)).read();
    }

    QuilletFilePackage readUsual(std::vector<ZipEntry> entries) {
        return read(usualPackage(std::move(entries)));
    }

    void expectRefused(const std::string& bytes, const std::string& message) {
        EXPECT_THAT([&] { read(bytes); }, ThrowsMessage<std::runtime_error>(
                                              AllOf(HasSubstr("a.docx"), HasSubstr(message))));
    }

    TemporaryFolder folder_;
};

std::vector<std::u16string> namesOf(const QuilletFilePackage& package) {
    std::vector<std::u16string> names;
    for (const Part& part : package.parts()) {
        names.push_back(part.partUri);
    }
    return names;
}

TEST_F(QuilletFileReaderTest, ReadsPartsInTheOrderOfTheArchive) {
    const auto package = readUsual({{"b.xml", "<b/>"}, {"a.txt", "text", true}, {"c.xml", "<c/>"}});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/b.xml", u"/a.txt", u"/c.xml"));
    EXPECT_EQ(package.parts()[0].contentType, u"application/xml");
    EXPECT_EQ(textOf(package.parts()[1].content), "text");
    EXPECT_EQ(package.parts()[1].contentType, u"text/plain");
}

TEST_F(QuilletFileReaderTest, ReadsAPackageWithoutPartsOrRelationships) {
    const auto package = readUsual({});
    EXPECT_THAT(package.parts(), IsEmpty());
    EXPECT_THAT(package.relationships(), IsEmpty());
}

TEST_F(QuilletFileReaderTest, ReadsTheRelationshipsOfThePackageAndOfParts) {
    const auto package = readUsual(
        {{"_rels/.rels",
          relationshipsXmlOf(
              "<Relationship Id='rId1' Type='urn:doc' Target='word/document.xml'/>")},
         {"word/document.xml", "<d/>"},
         {"word/_rels/document.xml.rels",
          relationshipsXmlOf(
              "<Relationship Id='rId2' Type='urn:image' Target='media/a.png' "
              "TargetMode='Internal'/>"
              "<Relationship Id='rId1' Type='urn:link' Target='http://example.org/?a=1&amp;b=2' "
              "TargetMode='External'/>")}});
    ASSERT_EQ(package.relationships().size(), 1U);
    EXPECT_EQ(package.relationships()[0].relationshipId, u"rId1");
    EXPECT_EQ(package.relationships()[0].relationshipType, u"urn:doc");
    EXPECT_EQ(package.relationships()[0].target, u"word/document.xml");
    EXPECT_EQ(package.relationships()[0].targetMode, 1);
    ASSERT_THAT(namesOf(package), ElementsAre(u"/word/document.xml"));
    const auto& links = package.parts()[0].relationships;
    ASSERT_EQ(links.size(), 2U);
    EXPECT_EQ(links[0].relationshipId, u"rId2");
    EXPECT_EQ(links[0].targetMode, 1);
    EXPECT_EQ(links[1].target, u"http://example.org/?a=1&b=2");
    EXPECT_EQ(links[1].targetMode, 0);
}

TEST_F(QuilletFileReaderTest, KeepsTargetsAsTheyStand) {
    const auto package =
        readUsual({{"_rels/.rels",
                    relationshipsXmlOf("<Relationship Id='a' Type='t' Target='./x/../y%20z.xml#f'/>"
                                       "<Relationship Id='b' Type='t' Target=''/>")}});
    EXPECT_EQ(package.relationships()[0].target, u"./x/../y%20z.xml#f");
    EXPECT_EQ(package.relationships()[1].target, u"");
}

TEST_F(QuilletFileReaderTest, LeavesOutWhatHasNoContentType) {
    const auto package = readUsual({{"a.bin", "x"}, {"b", "x"}, {"c.xml", "<c/>"}});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/c.xml"));
}

TEST_F(QuilletFileReaderTest, RefusesAReferenceToWhatHasNoContentType) {
    const auto linked = [](const std::string& attributes) {
        return usualPackage(
            {{"a.xml", "<a/>"},
             {"b.bin", "x"},
             {"_rels/a.xml.rels",
              relationshipsXmlOf("<Relationship Id='a' Type='t' " + attributes + "/>")}});
    };
    expectRefused(linked("Target='B.bin#x'"), "refers to \"B.bin#x\", which has no content type");
    expectRefused(
        usualPackage({{"b.bin", "x"},
                      {"_rels/.rels",
                       relationshipsXmlOf("<Relationship Id='a' Type='t' Target='b.bin'/>")}}),
        "refers to \"b.bin\", which has no content type");
    EXPECT_EQ(read(linked("Target='b.bin' TargetMode='External'")).parts().size(), 1U);
    EXPECT_EQ(read(linked("Target='c.bin'")).parts().size(), 1U);
}

TEST_F(QuilletFileReaderTest, KnowsTheTypesOfImagesWithoutOne) {
    const auto package = readUsual({{"a.PNG", "x"}, {"b.jpeg", "x"}, {"c.emf", "x"}});
    ASSERT_THAT(namesOf(package), ElementsAre(u"/a.PNG", u"/b.jpeg", u"/c.emf"));
    EXPECT_EQ(package.parts()[0].contentType, u"image/png");
    EXPECT_EQ(package.parts()[1].contentType, u"image/jpeg");
    EXPECT_EQ(package.parts()[2].contentType, u"image/x-emf");
}

TEST_F(QuilletFileReaderTest, DoesNotReadWhatItLeavesOut) {
    ZipEntry broken{"a.bin", "x"};
    broken.checksum = 0;
    ZipEntry encrypted{"b.bin", "x"};
    encrypted.flags = 1;
    EXPECT_THAT(namesOf(readUsual({broken, encrypted})), IsEmpty());
}

TEST_F(QuilletFileReaderTest, IsNotDisturbedByNamesOfWhatItLeavesOut) {
    EXPECT_THAT(namesOf(readUsual({{"x.foo", "1"}, {"X.FOO", "2"}, {"c.xml", "<c/>"}})),
                ElementsAre(u"/c.xml"));
    EXPECT_THAT(namesOf(readUsual({{"a.foo/[0].piece", "1"},
                                   {"b.foo/[1].last.piece", "1"},
                                   {"b.foo", "1"},
                                   {"c.xml", "<c/>"}})),
                ElementsAre(u"/c.xml"));
}

TEST_F(QuilletFileReaderTest, RefusesRelationshipsThatAreThereTwice) {
    expectRefused(usualPackage({{"a.xml", "<a/>"},
                                {"_rels/a.xml.rels", relationshipsXmlOf("")},
                                {"_RELS/a.xml.rels", relationshipsXmlOf("")}}),
                  "has two entries named \"/_rels/a.xml.rels\"");
}

TEST_F(QuilletFileReaderTest, LeavesOutFoldersAndTrash) {
    const auto package =
        readUsual({{"word/", ""}, {"[trash]/0000.xml", "x"}, {"word\\x.xml/", ""}});
    EXPECT_THAT(namesOf(package), IsEmpty());
}

TEST_F(QuilletFileReaderTest, TakesRelationshipsPartsForNoParts) {
    const auto package = readUsual({{"[Content_Types].xml.xml", "<x/>"},
                                    {"_rels/.rels", relationshipsXmlOf("")},
                                    {"gone/_rels/gone.xml.rels", "this is not even XML"}});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/[Content_Types].xml.xml"));
}

TEST_F(QuilletFileReaderTest, LeavesOutFoldersAndRelationshipsThatHaveAContentType) {
    const auto package = read(buildZip(
        {{"word.xml/", ""},
         {"word.xml/a.xml", "<a/>"},
         {"_rels/.rels", relationshipsXmlOf("")},
         {"[Content_Types].xml", typesXml("<Default Extension='xml' ContentType='a/b'/>"
                                          "<Default Extension='rels' ContentType='c/d'/>"
                                          "<Override PartName='/word.xml' ContentType='e/f'/>")}}));
    EXPECT_THAT(namesOf(package), ElementsAre(u"/word.xml/a.xml"));
}

TEST_F(QuilletFileReaderTest, ComparesNamesWithoutCaseAndEscapes) {
    const auto package =
        read(buildZip({{"WORD/Docu%6Dent.XML", "<d/>"},
                       {"word/_RELS/document.xml.rels",
                        relationshipsXmlOf("<Relationship Id='a' Type='t' Target='x'/>")},
                       {"[CONTENT_types].xml",
                        typesXml("<Override PartName='/word/document.xml' ContentType='a/b'/>"
                                 "<Default Extension='XML' ContentType='c/d'/>")}}));
    ASSERT_THAT(namesOf(package), ElementsAre(u"/WORD/Docu%6Dent.XML"));
    EXPECT_EQ(package.parts()[0].contentType, u"a/b");
    EXPECT_EQ(package.parts()[0].relationships.size(), 1U);
}

TEST_F(QuilletFileReaderTest, KeepsContentTypesWithTheirParameters) {
    const auto package = read(buildZip(
        {{"[Content_Types].xml",
          typesXml("<Default Extension='Txt' ContentType='text/plain; charset=\"utf-8\"'/>")},
         {"a.tXT", "x"}}));
    EXPECT_EQ(package.parts().at(0).contentType, u"text/plain; charset=\"utf-8\"");
}

TEST_F(QuilletFileReaderTest, KeepsNonAsciiAndEscapedNamesAsTheyStand) {
    const auto package = readUsual({{"m\xC3\xA9"
                                     "dia/\xE5\x9B\xBE 1.png",
                                     "x"},
                                    {"m%C3%A8dia/x%20y.png", "x"},
                                    {"n\x82.png", "x"}});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/m\u00E9dia/\u56FE 1.png", u"/m%C3%A8dia/x%20y.png",
                                              u"/n\u00E9.png"));
}

TEST_F(QuilletFileReaderTest, ReadsNamesWithBackslashesAndALeadingSlash) {
    const auto package = readUsual({{"word\\document.xml", "<d/>"}, {"/word/styles.xml", "<s/>"}});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/word/document.xml", u"/word/styles.xml"));
}

TEST_F(QuilletFileReaderTest, ReadsXmlWithPrefixesOfAnyKind) {
    const auto package = read(buildZip(
        {{"[Content_Types].xml",
          "<ct:Types xmlns:ct='http://schemas.openxmlformats.org/package/2006/content-types' "
          "xmlns:o='urn:other' xmlns='urn:third'><!-- c --><o:Default Extension='txt' "
          "ContentType='o/o'/><Default Extension='txt' ContentType='d/d'/>"
          "<p:Default xmlns:p='http://schemas.openxmlformats.org/package/2006/content-types' "
          "Extension='txt' ContentType='right/one'/></ct:Types>"},
         {"a.txt", "x"},
         {"_rels/a.txt.rels",
          "<r:Relationships xmlns:r='http://schemas.openxmlformats.org/package/2006/relationships'>"
          "<r:Relationship Id='a' Type='t' Target='x'/><Relationship Id='b' Type='t' Target='y'/>"
          "</r:Relationships>"}}));
    EXPECT_EQ(package.parts().at(0).contentType, u"right/one");
    EXPECT_EQ(package.parts().at(0).relationships.size(), 1U);
}

TEST_F(QuilletFileReaderTest, ReadsPackageXmlInUtf16AndWithAByteOrderMark) {
    const std::string ascii = typesXml("<Default Extension='txt' ContentType='a/b'/>").substr(21);
    std::string utf16 = "\xFF\xFE";
    for (const char c : ascii) {
        utf16 += std::string{c, '\0'};
    }
    EXPECT_EQ(read(buildZip({{"[Content_Types].xml", utf16}, {"a.txt", ""}})).parts().size(), 1U);
    EXPECT_EQ(read(buildZip({{"[Content_Types].xml", "\xEF\xBB\xBF" + ascii}, {"a.txt", ""}}))
                  .parts()
                  .size(),
              1U);
}

TEST_F(QuilletFileReaderTest, TakesEachAttributeAndElementOfPackageXmlOnce) {
    // Looking at all attributes of the root for each element would take hours.
    std::string xml = "<Types";
    for (int i = 0; i < 500'000; ++i) {
        xml.append(" xmlns:p").append(std::to_string(i)).append("='urn:x'");
    }
    xml +=
        " xmlns='http://schemas.openxmlformats.org/package/2006/content-types'>"
        "<Default Extension='txt' ContentType='a/b'/>";
    for (int i = 0; i < 500'000; ++i) {
        xml += "<p1:x/><p2:x/>";
    }
    xml += "</Types>";
    EXPECT_EQ(read(buildZip({{"[Content_Types].xml", xml}, {"a.txt", ""}})).parts().size(), 1U);
}

TEST_F(QuilletFileReaderTest, JoinsInterleavedPieces) {
    const auto package =
        read(buildZip({{"[Content_Types].xml/[0].piece",
                        typesXml("<Default Extension='xml' ContentType='a/b'/>").substr(0, 50)},
                       {"a.xml/[2].last.piece", "three"},
                       {"b.xml", "b"},
                       {"A.xml/[0].piece", "one ", true},
                       {"a.xml/[1].piece", "two "},
                       {"[Content_Types].xml/[1].last.piece",
                        typesXml("<Default Extension='xml' ContentType='a/b'/>").substr(50)}}));
    EXPECT_THAT(namesOf(package), ElementsAre(u"/a.xml", u"/b.xml"));
    EXPECT_EQ(textOf(package.parts()[0].content), "one two three");
}

TEST_F(QuilletFileReaderTest, RefusesMissingOrRepeatedPieces) {
    expectRefused(usualPackage({{"a.xml/[0].piece", "x"}}),
                  "lacks pieces of the interleaved part \"/a.xml\"");
    expectRefused(usualPackage({{"a.xml/[1].last.piece", "x"}}), "lacks pieces");
    expectRefused(usualPackage({{"a.xml/[0].piece", "x"}, {"a.xml/[2].last.piece", "x"}}),
                  "lacks pieces");
    expectRefused(usualPackage({{"a.xml/[0].last.piece", "x"}, {"a.xml/[1].last.piece", "x"}}),
                  "lacks pieces");
    expectRefused(usualPackage({{"a.xml/[0].piece", "x"}, {"A.xml/[0].last.piece", "x"}}),
                  "two entries named \"/a.xml\"");
    expectRefused(usualPackage({{"a.xml/[0].last.piece", "x"}, {"a.xml", "x"}}),
                  "two entries named");
}

TEST_F(QuilletFileReaderTest, RefusesNamesThatAreEqualButForCaseOrEscapes) {
    expectRefused(usualPackage({{"a.xml", "x"}, {"A.XML", "x"}}),
                  "has two entries named \"/a.xml\"");
    expectRefused(usualPackage({{"a b.xml", "x"}, {"a%20b.xml", "x"}}), "has two entries named");
    expectRefused(usualPackage({{"a/b.xml", "x"}, {"/a\\b.xml", "x"}}), "has two entries named");
    expectRefused(usualPackage({usualTypes()}), "has two entries named \"/[Content_Types].xml\"");
}

TEST_F(QuilletFileReaderTest, RefusesPartsWithInvalidNames) {
    expectRefused(usualPackage({{"a/../b.xml", "x"}}), "\"/a/../b.xml\" is not a valid part name");
    expectRefused(usualPackage({{"a//b.xml", "x"}}), "empty segment");
    expectRefused(usualPackage({{"a\nb.xml", "x"}}), "control character");
    expectRefused(usualPackage({{std::string("a\0b.xml", 7), "x"}}),
                  "entry \"a?b.xml\" has a zero in its name");
    expectRefused(usualPackage({{"", "x"}, {"100%.xml", "x"}}), "hexadecimal");
}

TEST_F(QuilletFileReaderTest, NamesThePartThatIsBroken) {
    ZipEntry entry{"word/document.xml", "text", true};
    entry.checksum = 1;
    expectRefused(usualPackage({entry}), "part: \"/word/document.xml\" is damaged (CRC)");
    entry.checksum.reset();
    entry.size = 5;
    expectRefused(usualPackage({entry}), "part: \"/word/document.xml\" is damaged (wrong size)");
    entry.size.reset();
    entry.flags = 1;
    expectRefused(usualPackage({entry}), "part: \"/word/document.xml\" is encrypted");
    entry.flags = 0;
    entry.method = 99;
    expectRefused(usualPackage({entry}),
                  "part: \"/word/document.xml\" is compressed with the unknown");
}

TEST_F(QuilletFileReaderTest, RefusesWhatIsNoPackage) {
    expectRefused("just text", "is not a zip archive");
    expectRefused(buildZip({{"a.xml", "<a/>"}}), "it has no [Content_Types].xml");
    EXPECT_THROW(QuilletFileReader(folder_.at("none.docx")).read(), std::runtime_error);
    EXPECT_THROW(QuilletFileReader(u"").read(), std::runtime_error);
    EXPECT_THROW(QuilletFileReader(u"\xD800").read(), std::runtime_error);
}

TEST_F(QuilletFileReaderTest, RefusesBrokenContentTypes) {
    const auto refused = [&](const std::string& xml, const std::string& message) {
        expectRefused(buildZip({{"[Content_Types].xml", xml}}),
                      "has a broken [Content_Types].xml, which " + message);
    };
    refused("", "is not well-formed XML");
    refused("no xml", "is not well-formed XML");
    refused("<Types>", "is not well-formed XML");
    refused(
        "<Types "
        "xmlns='http://schemas.openxmlformats.org/package/2006/content-types'><a></b></Types>",
        "is not well-formed XML");
    refused("<Types/>", "has another root element than Types");
    refused(relationshipsXmlOf(""), "has another root element than Types");
    refused("<!DOCTYPE Types [<!ENTITY a 'b'>]>" + typesXml("").substr(21),
            "has a document type declaration");
    refused(typesXml("<Default ContentType='a/b'/>"), "has a Default without Extension");
    refused(typesXml("<Default Extension='a'/>"), "has a Default without ContentType");
    refused(typesXml("<Override ContentType='a/b'/>"), "has a Override without PartName");
    refused(typesXml("<Override PartName='/a'/>"), "has a Override without ContentType");
    refused(typesXml("<Override PartName='/a' ContentType=''/>"),
            "has an empty content type for \"/a\"");
    refused(typesXml("<Override PartName='/a' ContentType='a/b'/>"
                     "<Override PartName='/A' ContentType='a/c'/>"),
            "has two content types for \"/a\"");
    refused(typesXml("<Default Extension='x' ContentType='a/b'/>"
                     "<Default Extension='X' ContentType='a/c'/>"),
            "has two content types for \"x\"");
}

TEST_F(QuilletFileReaderTest, AcceptsAContentTypeThatIsGivenTwice) {
    EXPECT_EQ(read(buildZip({{"[Content_Types].xml",
                              typesXml("<Override PartName='/a' ContentType='a/b'/>"
                                       "<Override PartName='/A' ContentType='A/b'/>")},
                             {"a", "x"}}))
                  .parts()
                  .size(),
              1U);
    EXPECT_EQ(read(buildZip({{"[Content_Types].xml",
                              typesXml("<Default Extension='x' ContentType='image/png'/>"
                                       "<Default Extension='X' ContentType='Image/PNG'/>")},
                             {"a.x", "x"}}))
                  .parts()
                  .at(0)
                  .contentType,
              u"image/png");
}

TEST_F(QuilletFileReaderTest, RefusesBrokenRelationships) {
    const auto refused = [&](const std::string& xml, const std::string& message) {
        expectRefused(usualPackage({{"a.xml", "<a/>"}, {"_rels/a.xml.rels", xml}}),
                      "has a broken relationships part: \"/_rels/a.xml.rels\" " + message);
    };
    refused("<Relationships", "is not well-formed XML");
    refused("<Relationships/>", "has another root element than Relationships");
    refused(relationshipsXmlOf("<Relationship Type='t' Target='x'/>"),
            "has a Relationship without Id");
    refused(relationshipsXmlOf("<Relationship Id='a' Target='x'/>"),
            "has a Relationship without Type");
    refused(relationshipsXmlOf("<Relationship Id='a' Type='t'/>"),
            "has a Relationship without Target");
    refused(relationshipsXmlOf("<Relationship Id='' Type='t' Target='x'/>"),
            "has a relationship without an id");
    refused(relationshipsXmlOf("<Relationship Id='a' Type='' Target='x'/>"),
            "has a relationship \"a\" without a type");
    refused(relationshipsXmlOf("<Relationship Id='a' Type='t' Target='x'/>"
                               "<Relationship Id='a' Type='t' Target='y'/>"),
            "has two relationships of the id \"a\"");
    refused(relationshipsXmlOf("<Relationship Id='a' Type='t' Target='\xFF'/>"), "");
}

TEST_F(QuilletFileReaderTest, RefusesHugePackageXml) {
    const std::string spaces(40 << 20, ' ');
    expectRefused(buildZip({{"[Content_Types].xml", typesXml(spaces)}}), "is too large: 419431");
    expectRefused(usualPackage({{"_rels/.rels", relationshipsXmlOf(spaces)}}),
                  "is too large: 419431");
}

// An item of that name that claims to be far larger than a package may be.
ZipEntry bomb(const std::string& name) {
    ZipEntry entry{name, std::string(5'000'000, 'x')};
    entry.method = 8;
    entry.isZip64 = true;
    entry.size = std::uint64_t{4} << 30;
    return entry;
}

TEST_F(QuilletFileReaderTest, CountsNoItemsThatAreNoParts) {
    const auto package = readUsual({{"a.xml", "<a/>"},
                                    bomb("b.untyped"),
                                    bomb("_rels/b.untyped.rels"),
                                    bomb("[trash]/0000.xml"),
                                    bomb("folder/")});
    EXPECT_THAT(namesOf(package), ElementsAre(u"/a.xml"));
}

TEST_F(QuilletFileReaderTest, LimitsPartsAndTheirRelationships) {
    expectRefused(usualPackage({bomb("a.xml")}), "entry \"a.xml\" is too large: 4294967296 bytes");
    expectRefused(usualPackage({bomb("_rels/.rels")}), "entry \"_rels/.rels\" is too large");
    expectRefused(usualPackage({{"a.xml", "<a/>"}, bomb("_rels/a.xml.rels")}),
                  "entry \"_rels/a.xml.rels\" is too large");
    expectRefused(buildZip({bomb("[Content_Types].xml")}),
                  "entry \"[Content_Types].xml\" is too large");
    ZipEntry half = bomb("a.xml/[0].piece");
    half.size = std::uint64_t{1} << 63;
    ZipEntry otherHalf = half;
    otherHalf.name = "a.xml/[1].last.piece";
    expectRefused(usualPackage({half, otherHalf}), "is too large: 9223372036854775808 bytes");
    half.name = "[Content_Types].xml/[0].piece";
    otherHalf.name = "[Content_Types].xml/[1].last.piece";
    expectRefused(buildZip({half, otherHalf}), "is too large: 9223372036854775808 bytes");
}

TEST_F(QuilletFileReaderTest, TellsTheSizeOfWhatItReads) {
    const std::string relationships =
        relationshipsXmlOf("<Relationship Id='a' Type='t' Target='x'/>");
    const std::string text(100'000, 'x');
    const std::string bytes = usualPackage({{"a.xml", "<a/>"},
                                            {"_rels/a.xml.rels", relationships},
                                            {"_rels/.rels", relationships},
                                            {"b.xml/[0].piece", text, true},
                                            {"b.xml/[1].last.piece", "end"},
                                            {"c.untyped", text}});
    QuilletFileReader reader(folder_.file("a.docx", bytes));
    const platform::package::PackageSize size = reader.size();
    EXPECT_EQ(size.parts, 2U);
    EXPECT_EQ(size.content, 4 + text.size() + 3);
    EXPECT_EQ(size.relationships, 2 * relationships.size());
    EXPECT_EQ(size.compressed, relationships.size());
    const QuilletFilePackage package = reader.read();
    EXPECT_THAT(namesOf(package), ElementsAre(u"/a.xml", u"/b.xml"));
}

TEST_F(QuilletFileReaderTest, ReadsTheFileWhoseSizeItTold) {
    const std::u16string path = folder_.file("a.docx", usualPackage({{"a.xml", "<a/>"}}));
    QuilletFileReader reader(path);
    EXPECT_EQ(reader.size().content, 4U);
    folder_.file("b.docx", usualPackage({{"b.xml", "<another/>"}}));
    std::filesystem::rename(folder_.path() / "b.docx", folder_.path() / "a.docx");
    EXPECT_THAT(namesOf(reader.read()), ElementsAre(u"/a.xml"));
    EXPECT_THAT(namesOf(reader.read()), ElementsAre(u"/b.xml"));
}

TEST_F(QuilletFileReaderTest, ReadsSeveralHundredPartsAndEmbeddedPackages) {
    std::vector<ZipEntry> entries;
    for (int i = 0; i < 700; ++i) {
        entries.push_back(
            {"xl/sheet" + std::to_string(i) + ".xml", "<s i='" + std::to_string(i) + "'/>", true});
    }
    entries.push_back({"embedded.txt", usualPackage({{"inner.xml", "<i/>"}})});
    const auto package = readUsual(entries);
    ASSERT_EQ(package.parts().size(), 701U);
    EXPECT_EQ(textOf(package.parts()[699].content), "<s i='699'/>");
    folder_.file("inner.docx", textOf(package.parts()[700].content));
    EXPECT_THAT(namesOf(QuilletFileReader(folder_.at("inner.docx")).read()),
                ElementsAre(u"/inner.xml"));
}

TEST_F(QuilletFileReaderTest, LeavesTheFileAlone) {
    const std::string bytes = usualPackage({{"a.xml", "<a/>"}});
    read(bytes);
    EXPECT_EQ(folder_.bytesOf("a.docx"), bytes);
    EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
}

TEST(QuilletFilePackage, TakesOverTheVectorsItIsBuiltFrom) {
    std::vector<Part> parts{{bytesOf("content"), u"a/b", u"/a", {}}};
    std::vector<Relationship> relationships{{u"t", u"x", u"a", 0}};
    const std::uint8_t* content = parts[0].content.data();
    const QuilletFilePackage package(parts, relationships);
    EXPECT_THAT(parts, IsEmpty());
    EXPECT_THAT(relationships, IsEmpty());
    EXPECT_EQ(package.parts()[0].content.data(), content);
    EXPECT_EQ(package.relationships()[0].targetMode, 0);
}

TEST(QuilletFilePackage, GivesCopiesUnlessItIsGivenUp) {
    std::vector<Part> parts{{bytesOf("content"), u"a/b", u"/a", {}}};
    std::vector<Relationship> relationships{{u"t", u"x", u"a", 1}};
    QuilletFilePackage package(parts, relationships);
    const std::uint8_t* content = package.parts()[0].content.data();
    EXPECT_NE(package.getParts()[0].content.data(), content);
    EXPECT_EQ(package.getParts().size(), 1U);
    EXPECT_EQ(package.getRelationships().size(), 1U);
    EXPECT_EQ(std::move(package).getParts()[0].content.data(), content);
    EXPECT_THAT(package.getParts(), IsEmpty());
    EXPECT_EQ(std::move(package).getRelationships()[0].target, u"x");
}

TEST(QuilletFilePackage, MakesRelationshipsInternalUnlessTold) {
    EXPECT_EQ(Relationship().targetMode, 1);
}

}  // namespace
}  // namespace test
