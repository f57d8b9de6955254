// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_package.h"
#include "platform/package/quillet_file_writer.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;
using platform::package::QuilletFilePackage;
using platform::package::QuilletFileWriter;
using test::writeFile;
using Part = QuilletFilePackage::Part;
using Relationship = QuilletFilePackage::Relationship;

std::vector<std::uint8_t> bytesOf(std::string_view text) {
    return {text.begin(), text.end()};
}

std::string textOf(const json::Value& value) {
    return json::serialize(value);
}

class PackageDocumentReading : public testing::Test {
protected:
    std::string encoded(std::string_view bytes, const std::string& type) const {
        return service.encodePartContent(bytesOf(bytes), type);
    }

    Serialization service;
    test::TemporaryDirectory folder;
};

TEST_F(PackageDocumentReading, AnswersAMissingFileWithTheStatusAlone) {
    EXPECT_EQ(
        textOf(json::Value(service.readPackageDocument(to_ustring((folder / "missing").string())))),
        R"({"status":false})");
}

TEST_F(PackageDocumentReading, AnswersWhyAFileIsNoPackage) {
    writeFile(folder / "file", "no archive at all");
    const json::Object result = service.readPackageDocument(to_ustring((folder / "file").string()));
    EXPECT_EQ(result.size(), 2u);
    EXPECT_FALSE(result.at("status").get<bool>());
    EXPECT_THAT(result.at("exception").get<std::string>(), testing::HasSubstr("not a zip archive"));
}

TEST_F(PackageDocumentReading, LooksForAPackageOnlyAtTheEndOfAFileThatNoMemoryHolds) {
    writeFile(folder / "file", "");
    std::filesystem::resize_file(folder / "file", std::uintmax_t{1} << 40);
    const json::Object result = service.readPackageDocument(to_ustring((folder / "file").string()));
    EXPECT_FALSE(result.at("status").get<bool>());
    EXPECT_THAT(result.at("exception").get<std::string>(), testing::HasSubstr("not a zip archive"));
}

TEST_F(PackageDocumentReading, AnswersWhyTheSystemCannotTellWhetherTheFileExists) {
    const json::Object result = service.readPackageDocument(std::u16string(5000, u'x'));
    EXPECT_EQ(result.size(), 2u);
    EXPECT_FALSE(result.at("status").get<bool>());
    EXPECT_THAT(result.at("exception").get<std::string>(),
                testing::HasSubstr("File name too long"));
}

TEST_F(PackageDocumentReading, AnswersAnEmptyPackageWithEmptyArrays) {
    std::vector<Part> parts;
    std::vector<Relationship> relationships;
    const std::u16string path = to_ustring((folder / "empty.docx").string());
    QuilletFileWriter writer(path, {});
    writer.write(QuilletFilePackage(parts, relationships));
    writer.close(false);
    EXPECT_EQ(textOf(json::Value(service.readPackageDocument(path))),
              R"({"parts":[],"relationships":[],"status":true})");
}

TEST_F(PackageDocumentReading, ConvertsPartsAndRelationshipsInTheirOrder) {
    std::vector<Part> parts(2);
    parts[0] = {bytesOf("<a/>"), u"application/xml", u"/z.xml", {}};
    parts[0].relationships.push_back({u"urn:type", u"other.bin", u"r1", 1});
    parts[0].relationships.push_back({u"urn:link", u"https://example.org/", u"r0", 0});
    parts[1] = {bytesOf("\xFF"), u"video/x", u"/a\u00E9.bin", {}};
    std::vector<Relationship> relationships{{u"urn:main", u"z.xml", u"r9", 1}};
    EXPECT_EQ(
        textOf(json::Value(service.packageToJson(QuilletFilePackage(parts, relationships)))),
        R"({"parts":[{"content":"<a/>","contentType":"application/xml","partUri":"/z.xml",)"
        R"("relationship":[{"relationshipId":"r1","relationshipType":"urn:type","target":"other.bin",)"
        R"("targetMode":""},{"relationshipId":"r0","relationshipType":"urn:link",)"
        R"("target":"https://example.org/","targetMode":""}]},{"content":")"
        "\xFF"
        R"(","contentType":"video/x","partUri":"/a)"
        "\xC3\xA9"
        R"(.bin","relationship":[]}],"relationships":[{"relationshipId":"r9",)"
        R"("relationshipType":"urn:main","target":"z.xml","targetMode":""}]})");
}

TEST_F(PackageDocumentReading, NeverTellsTheTargetMode) {
    for (const std::uint8_t mode : {std::uint8_t{0}, std::uint8_t{1}}) {
        const json::Object object =
            service.relationshipToJson({u"urn:type", u"target", u"id", mode});
        EXPECT_EQ(object.at("targetMode").get<std::string>(), "");
    }
}

TEST_F(PackageDocumentReading, SendsImagesAsDataUris) {
    EXPECT_EQ(encoded("\x89PNG", "image/png"), "data:image/png;base64,iVBORw==");
    EXPECT_EQ(encoded(std::string("\0\xFF", 2), "image/x"), "data:image/x;base64,AP8=");
}

TEST_F(PackageDocumentReading, SendsAnEmptyImageAsAnEmptyDataUri) {
    EXPECT_EQ(encoded("", "image/png"), "data:image/png;base64,");
}

TEST_F(PackageDocumentReading, KeepsAnImageThatIsADataUriAlready) {
    EXPECT_EQ(encoded("data:image/png;base64,AAAA", "image/png"), "data:image/png;base64,AAAA");
}

TEST_F(PackageDocumentReading, EncodesAnImageThatIsADataUriOfAnotherType) {
    EXPECT_EQ(encoded("data:image/jpeg;base64,", "image/png"),
              "data:image/png;base64,ZGF0YTppbWFnZS9qcGVnO2Jhc2U2NCw=");
}

TEST_F(PackageDocumentReading, SendsTheBytesOfEveryOtherTypeAsTheyStand) {
    const std::string bytes("\x89P\0\xFF", 4);
    for (const char* type : {"Image/png", "IMAGE/png", "application/octet-stream", "image", "",
                             "text/plain", "x-image/png"}) {
        EXPECT_EQ(encoded(bytes, type), bytes) << type;
    }
}

TEST_F(PackageDocumentReading, TakesTheBareImagePrefixForAnImage) {
    EXPECT_EQ(encoded("a", "image/"), "data:image/;base64,YQ==");
}

TEST_F(PackageDocumentReading, ThrowsOnATypeThatIsNotValidUtf16) {
    EXPECT_THROW(service.partToJson({{}, u"\xD800", u"/a", {}}), std::runtime_error);
    EXPECT_THROW(service.relationshipToJson({u"\xDC00", u"", u"", 1}), std::runtime_error);
}

}  // namespace
}  // namespace EditorServices
