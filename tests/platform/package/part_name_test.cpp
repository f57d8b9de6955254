// SPDX-License-Identifier: Apache-2.0
#include "platform/package/part_name.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace platform::package {
namespace {

using testing::HasSubstr;

TEST(PartName, KeysIgnoreTheCaseOfAsciiLettersOnly) {
    EXPECT_EQ(partNameKey("/Word/Document.XML"), partNameKey("/word/document.xml"));
    EXPECT_NE(partNameKey("/\xC3\x84.xml"), partNameKey("/\xC3\xA4.xml"));
    EXPECT_NE(partNameKey("/a.xml"), partNameKey("/b.xml"));
}

TEST(PartName, KeysResolveEscapesOnce) {
    EXPECT_EQ(partNameKey("/m%C3%A9dia%20x.png"), partNameKey("/M\xC3\xA9"
                                                              "dia x.png"));
    EXPECT_EQ(partNameKey("/m%c3%a9"), partNameKey("/m%C3%A9"));
    EXPECT_NE(partNameKey("/a%2541"), partNameKey("/aA"));
    EXPECT_EQ(partNameKey("/a%4"), "/a%4");
    EXPECT_EQ(partNameKey("/a%zz%"), "/a%zz%");
}

TEST(PartName, AcceptsWhatProducersWrite) {
    for (const char* name :
         {"/a", "/word/document.xml", "/xl/worksheets/sheet1.xml", "/a%20b.png", "/a b.png",
          "/m\xC3\xA9"
          "dia.png",
          "/{guid}/x[1].bin", "/.rels", "/a..b", "/_xmlsignatures/sig1.xml"}) {
        EXPECT_EQ(partNameProblem(name), "") << name;
    }
}

TEST(PartName, RefusesWhatNamesNoPart) {
    for (const char* name : {"", "a", "word/document.xml"}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("slash")) << name;
    }
    for (const char* name : {"/", "//", "//a", "/a/", "/a//b"}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("empty segment")) << name;
    }
    for (const char* name : {"/.", "/..", "/../a", "/a/./b", "/a.", "/a./b", "/..."}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("dot")) << name;
    }
    for (const char* name : {"/a?b", "/a#b", "/a\\b"}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("characters ? #")) << name;
    }
    for (const char* name : {"/a%", "/a%4", "/a%4g", "/100%.png"}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("hexadecimal")) << name;
    }
    for (const char* name : {"/a%2Fb", "/a%5cb", "/a%00", "/a%1F"}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("escaped")) << name;
    }
    for (const std::string_view name :
         {std::string_view("/a\0b", 4), std::string_view("/a\nb"), std::string_view("/a\x7F")}) {
        EXPECT_THAT(partNameProblem(name), HasSubstr("control")) << name;
    }
}

TEST(PartName, FindsTheExtensionOfTheLastSegment) {
    EXPECT_EQ(extensionOf("/a/b.tar.GZ"), "gz");
    EXPECT_EQ(extensionOf("/a.b/c"), "");
    EXPECT_EQ(extensionOf("/a/.rels"), "rels");
}

TEST(PartName, TellsWhoseRelationshipsAPartHolds) {
    EXPECT_EQ(relationshipsSource("/_rels/.rels"), "/");
    EXPECT_EQ(relationshipsSource("/word/_rels/document.xml.rels"), "/word/document.xml");
    EXPECT_EQ(relationshipsSource("/Word/_RELS/document.xml.RELS"), "/Word/document.xml");
    EXPECT_EQ(relationshipsSource("/_rels/a.xml.rels"), "/a.xml");
    EXPECT_EQ(relationshipsSource("/word/rels/document.xml.rels"), std::nullopt);
    EXPECT_EQ(relationshipsSource("/word/_rels/document.xml"), std::nullopt);
    EXPECT_EQ(relationshipsSource("/x_rels/document.xml.rels"), std::nullopt);
}

TEST(PartName, NamesTheRelationshipsPartOfASource) {
    for (const char* source : {"/", "/word/document.xml", "/a"}) {
        EXPECT_EQ(relationshipsSource(relationshipsPartName(source)), source);
    }
    EXPECT_EQ(relationshipsPartName("/"), "/_rels/.rels");
    EXPECT_EQ(relationshipsPartName("/word/document.xml"), "/word/_rels/document.xml.rels");
}

TEST(PartName, KnowsPieces) {
    const auto first = pieceNamed("/a/b.xml/[0].piece");
    ASSERT_TRUE(first);
    EXPECT_EQ(first->partName, "/a/b.xml");
    EXPECT_EQ(first->number, 0U);
    EXPECT_FALSE(first->isLast);
    const auto last = pieceNamed("/b.xml/[12].LAST.Piece");
    ASSERT_TRUE(last);
    EXPECT_EQ(last->number, 12U);
    EXPECT_TRUE(last->isLast);
    for (const char* name : {"/a/[].piece", "/a/[x].piece", "/a/[-1].piece", "/a/0.piece",
                             "/[0].piece", "/a/[0].pieces", "/a/[0]x.piece", "/a/[0.last.piece",
                             "/a/[99999999999999999999].piece"}) {
        EXPECT_FALSE(pieceNamed(name)) << name;
    }
}

TEST(PartName, KnowsTheTrash) {
    EXPECT_TRUE(isTrash("/[trash]/0000.dat"));
    EXPECT_TRUE(isTrash("/[Trash]/x"));
    EXPECT_FALSE(isTrash("/[trash]"));
    EXPECT_FALSE(isTrash("/trash/x"));
}

TEST(PartName, ResolvesTargetsAgainstTheirSource) {
    EXPECT_EQ(targetPartKey("/word/document.xml", "media/image1.png"), "/word/media/image1.png");
    EXPECT_EQ(targetPartKey("/word/document.xml", "../customXml/item1.xml"),
              "/customxml/item1.xml");
    EXPECT_EQ(targetPartKey("/word/document.xml", "/docProps/app.xml"), "/docprops/app.xml");
    EXPECT_EQ(targetPartKey("/", "word/document.xml"), "/word/document.xml");
    EXPECT_EQ(targetPartKey("/", "./word/./document.xml"), "/word/document.xml");
    EXPECT_EQ(targetPartKey("/a/b", "../../../c"), "/c");
    EXPECT_EQ(targetPartKey("/a/b", "m%C3%A9.png"), "/a/m\xC3\xA9.png");
    EXPECT_EQ(targetPartKey("/word/document.xml", "media\\image1.png"), "/word/media/image1.png");
}

TEST(PartName, TakesAFragmentAsAPlaceInTheNamedPart) {
    EXPECT_EQ(targetPartKey("/xl/drawings/drawing1.xml", "#Sheet1!A1"),
              "/xl/drawings/drawing1.xml");
    EXPECT_EQ(targetPartKey("/xl/a.xml", ""), "/xl/a.xml");
    EXPECT_EQ(targetPartKey("/xl/a.xml", "b.xml#x?y"), "/xl/b.xml");
    EXPECT_EQ(targetPartKey("/xl/a.xml", "b.xml?q=1"), "/xl/b.xml");
}

TEST(PartName, LeadsToNoPartFromTargetsOutside) {
    for (const char* target :
         {"http://example.org/a.xml", "mailto:a@example.org", "file:///c:/x.xlsx", "C:\\x.docx",
          "//host/a.xml", "\\\\host\\share\\a.xml", "/", "..", "./", "a+b-c.d:e"}) {
        EXPECT_EQ(targetPartKey("/a.xml", target), std::nullopt) << target;
    }
    EXPECT_EQ(targetPartKey("/", "#x"), std::nullopt);
    EXPECT_EQ(targetPartKey("/", "1http:x"), "/1http:x");
}

}  // namespace
}  // namespace platform::package
