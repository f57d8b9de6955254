// SPDX-License-Identifier: Apache-2.0
#include "platform/package/content_types.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace platform::package {
namespace {

constexpr std::string_view documentStart =
    "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n"
    "<Types xmlns=\"http://schemas.openxmlformats.org/package/2006/content-types\">";

std::string built(const std::vector<std::pair<std::string, std::string>>& parts,
                  bool hasRelationships = false) {
    ContentTypesBuilder builder;
    for (const auto& [name, type] : parts) {
        builder.add(name, type);
    }
    if (hasRelationships) {
        builder.addRelationships();
    }
    const std::string xml = builder.xml();
    EXPECT_TRUE(xml.starts_with(documentStart)) << xml;
    EXPECT_TRUE(xml.ends_with("</Types>")) << xml;
    const std::string body = xml.substr(documentStart.size());
    return body.substr(0, body.size() - 8);
}

TEST(ContentTypesBuilder, WritesNothingForNoParts) {
    EXPECT_EQ(built({}), "");
}

TEST(ContentTypesBuilder, GivesAnExtensionItsMostFrequentTypeAsDefault) {
    EXPECT_EQ(built({{"/a.png", "image/x"}, {"/b.PNG", "image/png"}, {"/c.png", "image/png"}}),
              "<Default Extension=\"png\" ContentType=\"image/png\"/>"
              "<Override PartName=\"/a.png\" ContentType=\"image/x\"/>");
}

TEST(ContentTypesBuilder, PrefersTheFirstOfEquallyFrequentTypes) {
    EXPECT_EQ(built({{"/a.bin", "a/a"}, {"/b.bin", "b/b"}}),
              "<Default Extension=\"bin\" ContentType=\"a/a\"/>"
              "<Override PartName=\"/b.bin\" ContentType=\"b/b\"/>");
}

TEST(ContentTypesBuilder, NamesXmlPartsOneByOneButForPlainXml) {
    EXPECT_EQ(built({{"/a.xml", "application/a+xml"}, {"/b.xml", "application/a+xml"}}),
              "<Override PartName=\"/a.xml\" ContentType=\"application/a+xml\"/>"
              "<Override PartName=\"/b.xml\" ContentType=\"application/a+xml\"/>");
    EXPECT_EQ(built({{"/a.xml", "application/a+xml"}, {"/b.xml", "application/xml"}}),
              "<Default Extension=\"xml\" ContentType=\"application/xml\"/>"
              "<Override PartName=\"/a.xml\" ContentType=\"application/a+xml\"/>");
}

TEST(ContentTypesBuilder, KeepsTheExtensionOfRelationshipsForThem) {
    EXPECT_EQ(built({{"/a.rels", "a/a"}}, true),
              "<Default Extension=\"rels\" "
              "ContentType=\"application/vnd.openxmlformats-package.relationships+xml\"/>"
              "<Override PartName=\"/a.rels\" ContentType=\"a/a\"/>");
}

TEST(ContentTypesBuilder, NamesPartsWithoutAPlainExtension) {
    EXPECT_EQ(built({{"/a", "a/a"}, {"/b.x%20y", "b/b"}, {"/c.", "c/c"}}),
              "<Override PartName=\"/a\" ContentType=\"a/a\"/>"
              "<Override PartName=\"/b.x%20y\" ContentType=\"b/b\"/>"
              "<Override PartName=\"/c.\" ContentType=\"c/c\"/>");
}

TEST(ContentTypesBuilder, SortsDefaultsAndKeepsTheOrderOfParts) {
    EXPECT_EQ(
        built({{"/z.png", "image/png"}, {"/2", "a/a"}, {"/a.gif", "image/gif"}, {"/1", "a/a"}}),
        "<Default Extension=\"gif\" ContentType=\"image/gif\"/>"
        "<Default Extension=\"png\" ContentType=\"image/png\"/>"
        "<Override PartName=\"/2\" ContentType=\"a/a\"/>"
        "<Override PartName=\"/1\" ContentType=\"a/a\"/>");
}

TEST(ContentTypesBuilder, EscapesNamesAndTypes) {
    EXPECT_EQ(built({{"/a&b", "a/b; c=\"<d>\""}}),
              "<Override PartName=\"/a&amp;b\" ContentType=\"a/b; c=&quot;&lt;d&gt;&quot;\"/>");
    EXPECT_EQ(built({{"/a", "a/b;\t\r\n"}}),
              "<Override PartName=\"/a\" ContentType=\"a/b;&#9;&#13;&#10;\"/>");
}

TEST(ContentTypesBuilder, RefusesWhatXmlCannotHold) {
    EXPECT_THROW(built({{"/a", std::string("a\0b", 3)}}), std::runtime_error);
    EXPECT_THROW(built({{"/a", "a\x1F"}}), std::runtime_error);
    EXPECT_THROW(built({{"/a\xEF\xBF\xBF", "a"}}), std::runtime_error);
    EXPECT_THROW(built({{"/a\xEF\xBF\xBE", "a"}}), std::runtime_error);
}

TEST(ContentTypes, FindWhatTheBuilderWrote) {
    const std::vector<std::pair<std::string, std::string>> parts = {{"/a.png", "image/x"},
                                                                    {"/b.PNG", "image/png"},
                                                                    {"/c.png", "image/png"},
                                                                    {"/m\xC3\xA9"
                                                                     "dia & co.xml",
                                                                     "a/b"},
                                                                    {"/x.XML", "application/xml"},
                                                                    {"/y", "a/b; c=\"\t<\""},
                                                                    {"/a.b.c", "a/c"},
                                                                    {"/r.rels", "a/r"}};
    ContentTypesBuilder builder;
    for (const auto& [name, type] : parts) {
        builder.add(name, type);
    }
    builder.addRelationships();
    const std::string xml = builder.xml();
    const ContentTypes types =
        ContentTypes::parse(std::vector<std::uint8_t>(xml.begin(), xml.end()));
    for (const auto& [name, type] : parts) {
        ASSERT_NE(types.find(name), nullptr) << name;
        EXPECT_EQ(*types.find(name), type) << name;
    }
    EXPECT_EQ(types.find("/other"), nullptr);
}

}  // namespace
}  // namespace platform::package
