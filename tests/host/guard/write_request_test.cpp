// SPDX-License-Identifier: Apache-2.0
// What the guard reads of a write request has to be what the bundle reads.
#include "host/guard/write_request.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "json/parser.h"

namespace {

using host::PathOverwrite;
using host::readWriteRequest;
using host::withFilePath;

TEST(WriteRequest, HasTheMembersOfATextWhateverTheirOrder) {
    const auto request = readWriteRequest(
        R"({ "encoding" : "UTF-8", "x": [{"filePath": "no"}, "}\""], "content":"a\"\u00e9",)"
        R"("filePath":"/a","contentType":"text/plain","rtcId":"7" } behind)");
    ASSERT_TRUE(request);
    EXPECT_EQ(request->rtcId, "7");
    EXPECT_EQ(request->filePath, "/a");
    EXPECT_FALSE(request->isPackage);
    EXPECT_EQ(request->text, R"("a\"\u00e9")");
    EXPECT_EQ(request->encoding, "UTF-8");
    EXPECT_TRUE(request->baseVersion.is<json::Undefined>());
}

TEST(WriteRequest, HasTheFirstOfMembersOfOneName) {
    const auto request = readWriteRequest(
        R"({"rtcId":"1","contentType":"a","filePath":"/a","file\u0050ath":"/b","content":"",)"
        R"("encoding":"","baseVersion":"v","baseVersion":1})");
    ASSERT_TRUE(request);
    EXPECT_EQ(request->filePath, "/a");
    EXPECT_EQ(request->baseVersion, json::Value("v"));
}

TEST(WriteRequest, NeedsNoEncodingForAPackage) {
    const auto request = readWriteRequest(
        R"({"rtcId":"1","contentType":"text/xml","filePath":"/a","content":{"parts":[]}})");
    ASSERT_TRUE(request);
    EXPECT_TRUE(request->isPackage);
}

TEST(WriteRequest, IsNoneWhereTheBundleGivesNoAnswer) {
    for (const char* payload : {
             "",
             "{}",
             "{",
             "[]",
             R"( {"rtcId":"1","contentType":"a","filePath":"/a","content":"","encoding":""})",
             R"({"contentType":"a","filePath":"/a","content":"","encoding":""})",
             R"({"rtcId":1,"contentType":"a","filePath":"/a","content":"","encoding":""})",
             R"({"rtcId":"1","contentType":"a","content":"","encoding":""})",
             R"({"rtcId":"1","contentType":"a","filePath":"/a","content":[],"encoding":""})",
             R"({"rtcId":"1","contentType":"a","filePath":"/a","content":""})",
             R"({"rtcId":"1","contentType":"a","filePath":"/a\u0000","content":"","encoding":""})",
             "{\"rtcId\":\"1\",\"contentType\":\"a\",\"filePath\":\"\xFF\",\"content\":\"\","
             "\"encoding\":\"\"}",
             R"({"rtcId":"1","contentType":"text/xml","filePath":"/a","content":""})",
             R"({"rtcId":"1","contentType":"a","filePath":"/a","content":"","encoding":"")",
             R"({"rtcId":"1","contentType":"a","filePath":"/a","content":"","encoding":""])",
             R"({"rtcId":"1","contentType":"a","filePath":"/a","content":")",
         }) {
        EXPECT_FALSE(readWriteRequest(payload)) << payload;
    }
}

TEST(WriteRequest, IsNoneWhosePathIsTooLong) {
    const auto requestOf = [](std::size_t pathLength) {
        return R"({"rtcId":"1","contentType":"a","content":"","encoding":"","filePath":")" +
               std::string(pathLength, 'x') + "\"}";
    };
    EXPECT_TRUE(readWriteRequest(requestOf(PATH_MAX - 1)));
    EXPECT_FALSE(readWriteRequest(requestOf(PATH_MAX)));
}

// Two readers that disagree could have the guard compare one file and the bundle write another.
TEST(WriteRequest, IsReadAsTheParserReadsItCutAtAnyByte) {
    const std::string whole =
        R"({"a":{"b":[1,"]"]},"rtcId":"1","contentType":"a","filePath":"/a\"","content":"\\",)"
        R"("encoding":"x","kqdata":[1],"kqtype":"int8","baseVersion":null})";
    ASSERT_TRUE(readWriteRequest(whole));
    for (std::size_t length = 0; length < whole.size(); ++length) {
        EXPECT_FALSE(readWriteRequest(whole.substr(0, length))) << length;
    }
}

TEST(WriteRequest, GetsAnotherPathInFrontOfItsOwn) {
    const std::string request = withFilePath(R"({"filePath":"/a","rtcId":"1"})", "/b\"c");
    EXPECT_EQ(json::parse(request)["filePath"], json::Value("/b\"c"));
    EXPECT_EQ(json::parse(request)["rtcId"], json::Value("1"));
}

TEST(WriteRequest, HasAnotherPathWrittenOverItsOwnForAWhile) {
    std::string own =
        R"({"rtcId":"1","filePath":"/\u00E9\"","filePath":"/b","contentType":"a","content":"",)"
        R"("encoding":""})";
    const std::string_view path = readWriteRequest(own)->filePathText;
    ASSERT_EQ(path, R"("/\u00E9\"")");
    for (const char* const other : {"", "/b\"", "/12345678"}) {
        json::Object expected = json::parse(own);
        {
            const PathOverwrite overwrite(path, other);
            EXPECT_TRUE(overwrite.isDone());
            expected["filePath"] = json::Value(other);
            EXPECT_EQ(json::Value(json::parse(own)), json::Value(expected));
        }
        EXPECT_EQ(json::parse(own)["filePath"], json::Value("/é\""));
        EXPECT_EQ(path, R"("/\u00E9\"")");
    }
}

// The bundle refuses such a request, and is to see that it is one.
TEST(WriteRequest, KeepsWhatStandsBehindItsPathWhenAnotherIsWrittenOverIt) {
    std::string own =
        R"({"rtcId":"1","filePath":"/123456789"x "y":1,"contentType":"a","content":"","encoding":""})";
    const std::string_view path = readWriteRequest(own)->filePathText;
    EXPECT_EQ(path, R"("/123456789")");
    const PathOverwrite overwrite(path, "/b");
    EXPECT_TRUE(overwrite.isDone());
    EXPECT_THAT(own, testing::HasSubstr(R"("/b"        x "y":1,)"));
}

TEST(WriteRequest, KeepsItsPathWhereThereIsNoRoomForAnother) {
    std::string own =
        R"({"filePath":"/abc","rtcId":"1","contentType":"a","content":"","encoding":""})";
    const std::string before = own;
    for (const char* const other : {"/abcd", "/ab\""}) {
        const PathOverwrite overwrite(readWriteRequest(own)->filePathText, other);
        EXPECT_FALSE(overwrite.isDone());
        EXPECT_EQ(own, before);
    }
}

}  // namespace
