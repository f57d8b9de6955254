// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_package.h"
#include "platform/package/quillet_file_reader.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;
using platform::package::QuilletFilePackage;
using test::readFile;
using test::writeFile;

json::Array array(std::string_view text) {
    return json::parse("{\"v\":" + std::string(text) + "}").at("v").get<json::Array>();
}

class PackageDocumentWriting : public testing::Test {
protected:
    bool write(std::string_view document) const {
        return service.writePackageDocument(to_ustring(path.string()), json::parse(document));
    }

    std::string decoded(std::string content, const std::string& type) const {
        const auto bytes = service.decodePartContent(std::move(content), type);
        return {bytes.begin(), bytes.end()};
    }

    /// The document as it reads again.
    std::string readAgain() const {
        return json::serialize(json::Value(service.readPackageDocument(to_ustring(path.string()))));
    }

    /// The stored mode of a relationship whose "targetMode" is `mode`.
    int storedMode(const std::string& mode, bool allowInternal = true) const {
        const auto relationships = service.relationshipsFromJson(
            array(R"([{"relationshipType":"t","target":"u","relationshipId":"i","targetMode":)" +
                  json::serialize(json::Value(mode)) + "}]"),
            allowInternal);
        return relationships.at(0).targetMode;
    }

    Serialization service;
    test::TemporaryDirectory folder;
    const std::filesystem::path path = folder / "file.docx";
};

TEST_F(PackageDocumentWriting, StoresWhatReadsTheSameAgain) {
    const std::string document =
        R"({"parts":[{"content":"<a/>","contentType":"application/xml","partUri":"/a.xml",)"
        R"("relationship":[{"relationshipId":"r1","relationshipType":"urn:t","target":"b.png",)"
        R"("targetMode":""}]},{"content":"data:image/png;base64,iVBORw==",)"
        R"("contentType":"image/png","partUri":"/b.png","relationship":[]}],)"
        R"("relationships":[{"relationshipId":"r1","relationshipType":"urn:m","target":"a.xml",)"
        R"("targetMode":""}],"status":true})";
    EXPECT_TRUE(write(document));
    EXPECT_EQ(readAgain(), document);
}

TEST_F(PackageDocumentWriting, StoresAnEmptyPackage) {
    EXPECT_TRUE(write(R"({"parts":[],"relationships":[]})"));
    EXPECT_EQ(readAgain(), R"({"parts":[],"relationships":[],"status":true})");
}

TEST_F(PackageDocumentWriting, ReplacesASparseFileOfFourGigabytesWhole) {
    writeFile(path, "");
    std::filesystem::resize_file(path, std::uintmax_t{1} << 32);
    EXPECT_TRUE(write(R"({"parts":[],"relationships":[]})"));
    EXPECT_EQ(readAgain(), R"({"parts":[],"relationships":[],"status":true})");
}

TEST_F(PackageDocumentWriting, ThrowsWhenPartsOrRelationshipsAreNoArray) {
    const auto failure = [&](std::string_view document) -> std::string {
        try {
            write(document);
        } catch (const std::runtime_error& error) {
            return error.what();
        }
        return "no failure";
    };
    EXPECT_EQ(failure(R"({"parts":{},"relationships":[]})"), "invalid conversion: object to array");
    EXPECT_EQ(failure(R"({"relationships":[]})"), "invalid conversion: undefined to array");
    EXPECT_EQ(failure(R"({"parts":[],"relationships":"x"})"),
              "invalid conversion: string to array");
    EXPECT_EQ(failure(R"({"parts":[]})"), "invalid conversion: undefined to array");
    EXPECT_EQ(failure(R"({"parts":null,"relationships":1})"), "invalid conversion: null to array");
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(PackageDocumentWriting, ThrowsOnFaultyArraysEvenWhenThePathIsEmpty) {
    EXPECT_THROW(service.writePackageDocument(u"", {}), std::runtime_error);
}

TEST_F(PackageDocumentWriting, ToAnEmptyPathIsRefused) {
    EXPECT_FALSE(
        service.writePackageDocument(u"", json::parse(R"({"parts":[],"relationships":[]})")));
}

TEST_F(PackageDocumentWriting, OfAFaultyElementIsRefusedWithTheFileUntouched) {
    writeFile(path, "old");
    const std::string relationship = R"("relationshipType":"t","target":"u","relationshipId":"i")";
    for (
        const std::string& document : std::vector<std::string>{
            R"({"parts":[1],"relationships":[]})",
            R"({"parts":[[]],"relationships":[]})",
            R"({"parts":[],"relationships":[null]})",
            R"({"parts":[{"contentType":"a/b","content":"","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":1,"contentType":"a/b","content":"","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","content":"","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":[],"content":"","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"a/b","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"a/b","content":null,"relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"a/b","content":""}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"a/b","content":"","relationship":{}}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"a/b","content":"","relationship":["x"]}],"relationships":[]})",
            R"({"parts":[],"relationships":[{"target":"u","relationshipId":"i"}]})",
            R"({"parts":[],"relationships":[{"relationshipType":"t","relationshipId":"i"}]})",
            R"({"parts":[],"relationships":[{"relationshipType":"t","target":"u"}]})",
            R"({"parts":[],"relationships":[{"relationshipType":1,"target":"u","relationshipId":"i"}]})",
            R"({"parts":[],"relationships":[{"relationshipType":"t","target":{},"relationshipId":"i"}]})",
            R"({"parts":[],"relationships":[{"relationshipType":"t","target":"u","relationshipId":true}]})",
            R"({"parts":[],"relationships":[{)" + relationship + R"(,"targetMode":null}]})",
            R"({"parts":[{"partUri":"/a","contentType":"application/x","content":")"
            "\xFF"
            R"(","relationship":[]}],"relationships":[]})",
            R"({"parts":[{"partUri":"/a","contentType":"image/png","content":"data:,*","relationship":[]}],"relationships":[]})",
        }) {
        EXPECT_FALSE(write(document)) << document;
        EXPECT_EQ(readFile(path), "old");
    }
}

TEST_F(PackageDocumentWriting, NamesTheFirstOfSeveralFaultyKeysOfAPart) {
    const auto failure = [&](const std::string& part) -> std::string {
        try {
            service.partsFromJson(array("[" + part + "]"));
        } catch (const std::runtime_error& error) {
            return error.what();
        }
        return "no failure";
    };
    EXPECT_EQ(failure(R"({"partUri":null,"contentType":true,"content":1,"relationship":"x"})"),
              "invalid conversion: null to string");
    EXPECT_EQ(failure(R"({"partUri":"","contentType":true,"content":1,"relationship":"x"})"),
              "invalid conversion: boolean to string");
    EXPECT_EQ(failure(R"({"partUri":"","contentType":"","content":1,"relationship":"x"})"),
              "invalid conversion: double to string");
    EXPECT_EQ(failure(R"({"partUri":"","contentType":"","content":"","relationship":"x"})"),
              "invalid conversion: string to array");
    EXPECT_EQ(failure(R"({"partUri":"","contentType":"","content":""})"),
              "invalid conversion: undefined to array");
    EXPECT_EQ(failure("[]"), "invalid conversion: array to object");
}

TEST_F(PackageDocumentWriting, NamesTheFirstOfSeveralFaultyKeysOfARelationship) {
    const auto failure = [&](const std::string& relationship) -> std::string {
        try {
            service.relationshipsFromJson(array("[" + relationship + "]"), true);
        } catch (const std::runtime_error& error) {
            return error.what();
        }
        return "no failure";
    };
    EXPECT_EQ(
        failure(R"({"relationshipType":null,"target":true,"relationshipId":1,"targetMode":[]})"),
        "invalid conversion: null to string");
    EXPECT_EQ(
        failure(R"({"relationshipType":"","target":true,"relationshipId":1,"targetMode":[]})"),
        "invalid conversion: boolean to string");
    EXPECT_EQ(failure(R"({"relationshipType":"","target":"","relationshipId":1,"targetMode":[]})"),
              "invalid conversion: double to string");
    EXPECT_EQ(failure(R"({"relationshipType":"","target":"","relationshipId":"","targetMode":[]})"),
              "invalid conversion: array to string");
    EXPECT_EQ(failure("1"), "invalid conversion: double to object");
}

TEST_F(PackageDocumentWriting, TakesNullAsNoRelationships) {
    const auto parts = service.partsFromJson(
        array(R"([{"partUri":"/a","contentType":"a/b","content":"c","relationship":null}])"));
    ASSERT_EQ(parts.size(), 1u);
    EXPECT_EQ(parts[0].partUri, u"/a");
    EXPECT_EQ(parts[0].contentType, u"a/b");
    EXPECT_EQ(parts[0].content, std::vector<std::uint8_t>{'c'});
    EXPECT_TRUE(parts[0].relationships.empty());
}

TEST_F(PackageDocumentWriting, TakesARelationshipWithoutAModeForInternal) {
    const auto relationships = service.relationshipsFromJson(
        array(R"([{"relationshipType":"t","target":"u","relationshipId":"i"}])"), true);
    ASSERT_EQ(relationships.size(), 1u);
    EXPECT_EQ(relationships[0].relationshipType, u"t");
    EXPECT_EQ(relationships[0].target, u"u");
    EXPECT_EQ(relationships[0].relationshipId, u"i");
    EXPECT_EQ(relationships[0].targetMode, 1);
}

TEST_F(PackageDocumentWriting, TakesForExternalWhatBeginsWithTheWord) {
    EXPECT_EQ(storedMode("External"), 0);
    EXPECT_EQ(storedMode("External "), 0);
    EXPECT_EQ(storedMode("Externally"), 0);
    EXPECT_EQ(storedMode("ExternalExternal"), 0);
    EXPECT_EQ(storedMode(""), 1);
    EXPECT_EQ(storedMode("Internal"), 1);
    EXPECT_EQ(storedMode("external"), 1);
    EXPECT_EQ(storedMode(" External"), 1);
    EXPECT_EQ(storedMode("Extern"), 1);
}

TEST_F(PackageDocumentWriting, StoresTheModesOfThePackagesAndOfItsPartsRelationships) {
    const std::string both =
        R"([{"relationshipId":"in","relationshipType":"t","target":"/a.txt","targetMode":""},)"
        R"({"relationshipId":"out","relationshipType":"t","target":"/a.txt","targetMode":"External"}])";
    ASSERT_TRUE(write(R"({"parts":[{"partUri":"/a.txt","contentType":"text/plain","content":"",)"
                      R"("relationship":)" +
                      both + R"(}],"relationships":)" + both + "}"));
    const QuilletFilePackage package =
        platform::package::QuilletFileReader(to_ustring(path.string())).read();
    ASSERT_EQ(package.getParts().size(), 1u);
    for (const auto& stored : {package.getRelationships(), package.getParts()[0].relationships}) {
        ASSERT_EQ(stored.size(), 2u);
        EXPECT_EQ(stored[0].targetMode, 1);
        EXPECT_EQ(stored[1].targetMode, 0);
    }
}

TEST_F(PackageDocumentWriting, TakesEveryRelationshipForExternalWhereInternalOnesAreNotAllowed) {
    EXPECT_EQ(storedMode("", false), 0);
    EXPECT_EQ(storedMode("External", false), 0);
}

TEST_F(PackageDocumentWriting, DecodesTheDataUrisOfImages) {
    EXPECT_EQ(decoded("data:image/png;base64,iVBORw==", "image/png"), "\x89PNG");
    EXPECT_EQ(decoded("data:,iVBORw==", "image/png"), "\x89PNG");
    EXPECT_EQ(decoded("data:text/html,iVBORw==", "image/png"), "\x89PNG");
    EXPECT_EQ(decoded("data:image/png;base64,", "image/png"), "");
}

TEST_F(PackageDocumentWriting, TakesADataUriWithoutACommaForBase64AsAWhole) {
    // The colon is not base64, so that only the refusal shows what was taken.
    EXPECT_THROW(decoded("data:AAAA", "image/png"), std::runtime_error);
}

TEST_F(PackageDocumentWriting, StoresImagesThatAreNoDataUrisAsTheyStand) {
    const std::string bytes("\x89PNG\0\x01", 6);
    EXPECT_EQ(decoded(bytes, "image/png"), bytes);
    EXPECT_EQ(decoded("Data:,AAAA", "image/png"), "Data:,AAAA");
    EXPECT_EQ(decoded("", "image/png"), "");
}

TEST_F(PackageDocumentWriting, CleansTheTextOfApplicationTypes) {
    EXPECT_EQ(decoded("a\xE2\x80\x8B\x01\xEF\xBF\xBFz\t\n\r", "application/xml"),
              "a\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBDz\t\n\r");
    EXPECT_EQ(decoded("data:,AAAA", "application/"), "data:,AAAA");
}

TEST_F(PackageDocumentWriting, RefusesApplicationTypesWhoseBytesAreNoText) {
    EXPECT_THROW(decoded("\xFF\xFE", "application/octet-stream"), std::runtime_error);
}

TEST_F(PackageDocumentWriting, StoresEveryOtherTypeByteForByte) {
    const std::string bytes("\x01\x7F\xFF\0\xE2\x80\x8B", 7);
    for (const char* type :
         {"text/plain", "Application/octet-stream", "application", "", "audio/x"}) {
        EXPECT_EQ(decoded(bytes, type), bytes) << type;
    }
    EXPECT_EQ(decoded("data:image/png;base64,AAAA", "Image/png"), "data:image/png;base64,AAAA");
}

TEST_F(PackageDocumentWriting, ThatFailsAnswersFalse) {
    EXPECT_FALSE(service.writePackageDocument(to_ustring((folder / "no/such/folder.docx").string()),
                                              json::parse(R"({"parts":[],"relationships":[]})")));
    // A name that no package can hold.
    EXPECT_FALSE(write(
        R"({"parts":[{"partUri":"","contentType":"a/b","content":"","relationship":[]}],"relationships":[]})"));
    EXPECT_FALSE(std::filesystem::exists(path));
}

}  // namespace
}  // namespace EditorServices
