// SPDX-License-Identifier: Apache-2.0
// Write requests through the loaded bundle and the bus.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "json/parser.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::Message;
using test::notificationChannel;
using test::readFile;
using test::takeBusLog;
using test::writeFile;
using test::writeRequestChannel;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class WriteRequests : public testing::Test {
protected:
    static json::Object textRequest(const std::string& path, const std::string& text,
                                    const std::string& encoding = "UTF-8") {
        json::Object request;
        request["rtcId"] = "7";
        request["contentType"] = "text/plain";
        request["filePath"] = path;
        request["content"] = text;
        request["encoding"] = encoding;
        return request;
    }

    static json::Object packageRequest(const std::string& path, json::Value content) {
        json::Object request;
        request["rtcId"] = "7";
        request["contentType"] = "text/xml";
        request["filePath"] = path;
        request["content"] = std::move(content);
        return request;
    }

    std::vector<Message> send(const json::Object& request) {
        return bundle.send(writeRequestChannel, json::serialize(json::Value(request)));
    }

    static Message notification(const std::string& path, bool existed) {
        return {notificationChannel, R"({"filePath":)" + json::serialize(json::Value(path)) +
                                         R"(,"isExistingFile":)" + (existed ? "true}" : "false}")};
    }

    static Message answer(bool written) {
        return {"/zpr/service/writeResponse/7", written ? "true" : "false"};
    }

    test::TemporaryDirectory folder;
    test::RunningBundle bundle;
    const std::string path = (folder / "file.txt").string();
};

TEST_F(WriteRequests, AnnounceANewFileAndThenAnswer) {
    EXPECT_THAT(send(textRequest(path, "text")),
                ElementsAre(notification(path, false), answer(true)));
    EXPECT_EQ(readFile(path), "text");
}

TEST_F(WriteRequests, AnnounceAReplacedFileAsExisting) {
    send(textRequest(path, "first"));
    EXPECT_THAT(send(textRequest(path, "second")),
                ElementsAre(notification(path, true), answer(true)));
    EXPECT_EQ(readFile(path), "second");
}

TEST_F(WriteRequests, AnnounceAFolderInTheWayAsExistingAndAnswerFalse) {
    const std::string inTheWay = folder.path().string();
    EXPECT_THAT(send(textRequest(inTheWay, "text")),
                ElementsAre(notification(inTheWay, true), answer(false)));
}

TEST_F(WriteRequests, ThatFailAnnounceTheFileAllTheSame) {
    const std::string missing = (folder / "missing/file.txt").string();
    EXPECT_THAT(send(textRequest(missing, "text")),
                ElementsAre(notification(missing, false), answer(false)));
    EXPECT_THAT(send(textRequest(path, "text", "no-such-charset")),
                ElementsAre(notification(path, false), answer(false)));
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, WithAnEmptyRtcIdAreAnsweredOnTheBarePrefix) {
    json::Object request = textRequest(path, "text");
    request["rtcId"] = "";
    EXPECT_THAT(send(request), ElementsAre(notification(path, false),
                                           Message{"/zpr/service/writeResponse/", "true"}));
}

TEST_F(WriteRequests, AnnounceThePathByteForByteAsItCame) {
    const std::string name =
        (folder / "./na\xC3\xAFve \xE6\x97\xA5\xE6\x9C\xAC \"q\".txt").string();
    EXPECT_THAT(send(textRequest(name, "text")),
                ElementsAre(notification(name, false), answer(true)));
    EXPECT_EQ(readFile(name), "text");
}

TEST_F(WriteRequests, StoreTextInItsCharset) {
    const std::string text = "\xCF\xF0\xE8\xE2\xE5\xF2";
    EXPECT_THAT(send(textRequest(path, text, "windows-1251")),
                ElementsAre(notification(path, false), answer(true)));
    EXPECT_EQ(readFile(path), text);
}

TEST_F(WriteRequests, AnswerTrueAfterAWriteErrorPastASuccessfulOpen) {
    EXPECT_THAT(send(textRequest("/dev/full", std::string(100'000, 'x'))),
                ElementsAre(notification("/dev/full", true), answer(true)));
}

TEST_F(WriteRequests, WithAMissingOrWrongKeyWriteAnnounceAndAnswerNothing) {
    for (const std::string key : {"rtcId", "contentType", "filePath", "content", "encoding"}) {
        json::Object missing = textRequest(path, "text");
        missing.erase(key);
        EXPECT_THAT(send(missing), IsEmpty()) << key;
        for (const char* wrong : {"null", "true", "1", "[]", "{}"}) {
            json::Object request = textRequest(path, "text");
            request[key] = json::parse(std::string(R"({"v":)") + wrong + "}").at("v");
            EXPECT_THAT(send(request), IsEmpty()) << key << ' ' << wrong;
        }
    }
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, ThatAreNotJsonWriteAnnounceAndAnswerNothing) {
    for (const char* request : {"", "{", "[]", "true", " {}"}) {
        EXPECT_THAT(bundle.send(writeRequestChannel, request), IsEmpty()) << request;
    }
}

TEST_F(WriteRequests, WhosePathTheSystemRefusesWriteAnnounceAndAnswerNothing) {
    EXPECT_THAT(send(textRequest(std::string(5000, 'x'), "text")), IsEmpty());
    EXPECT_THAT(send(textRequest(path + '\0', "text")), IsEmpty());
    EXPECT_THAT(send(textRequest(path + "\xFF", "text")), IsEmpty());
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, ForAPackageNeedAnObjectAsContent) {
    for (const char* wrong : {R"("text")", "null", "true", "1", "[]"}) {
        EXPECT_THAT(
            send(packageRequest(path, json::parse(std::string(R"({"v":)") + wrong + "}").at("v"))),
            IsEmpty())
            << wrong;
    }
    json::Object missing = packageRequest(path, json::Value());
    missing.erase("content");
    EXPECT_THAT(send(missing), IsEmpty());
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, ForAPackageGetNoAnswerWhenPartsAreNoArray) {
    for (const char* wrong : {R"({"parts":{},"relationships":[]})", R"({"parts":[]})",
                              R"({"relationships":[]})", R"({"parts":[],"relationships":null})"}) {
        EXPECT_THAT(send(packageRequest(path, json::Value(json::parse(wrong)))), IsEmpty())
            << wrong;
    }
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, ForAPackageAnswerFalseWhenAnElementIsFaulty) {
    for (const char* faulty :
         {R"({"parts":[1],"relationships":[]})", R"({"parts":[{}],"relationships":[]})",
          R"({"parts":[],"relationships":["x"]})"}) {
        EXPECT_THAT(send(packageRequest(path, json::Value(json::parse(faulty)))),
                    ElementsAre(notification(path, false), answer(false)))
            << faulty;
    }
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, ForAPackageDoNotReadAnEncoding) {
    json::Object request =
        packageRequest(path, json::Value(json::parse(R"({"parts":[],"relationships":[]})")));
    request["encoding"] = 1.0;
    EXPECT_THAT(send(request), ElementsAre(notification(path, false), answer(true)));
    EXPECT_TRUE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, StoreTextWithoutAByteOrderMark) {
    EXPECT_THAT(send(textRequest(path, "abc")),
                ElementsAre(notification(path, false), answer(true)));
    EXPECT_EQ(readFile(path), "abc");
}

TEST_F(WriteRequests, OfEmptyTextTruncateTheFile) {
    writeFile(path, "old");
    EXPECT_THAT(send(textRequest(path, "")), ElementsAre(notification(path, true), answer(true)));
    EXPECT_EQ(readFile(path), "");
}

TEST_F(WriteRequests, InAnUnknownCharsetLeaveTheFileAsItWas) {
    writeFile(path, "old");
    EXPECT_THAT(send(textRequest(path, "new", "no-such-charset")),
                ElementsAre(notification(path, true), answer(false)));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(WriteRequests, OfTextThatIsNotInItsCharsetLeaveTheFileAsItWas) {
    writeFile(path, "old");
    EXPECT_THAT(send(textRequest(path, "caf\xE9")),
                ElementsAre(notification(path, true), answer(false)));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(WriteRequests, OfTextThatCannotBeEncodedAgainLeaveTheFileAsItWas) {
    writeFile(path, "old");
    // EUC-JP has a second code for the cent sign, but no way to write it.
    EXPECT_THAT(send(textRequest(path, "\x8E\xE0", "EUC-JP")),
                ElementsAre(notification(path, true), answer(false)));
    EXPECT_EQ(readFile(path), "old");
}

TEST_F(WriteRequests, ToAnEmptyPathAreAnnouncedAndAnsweredFalse) {
    EXPECT_THAT(send(textRequest("", "text")), ElementsAre(notification("", false), answer(false)));
    EXPECT_THAT(send(packageRequest("", json::parse(R"({"parts":[],"relationships":[]})"))),
                ElementsAre(notification("", false), answer(false)));
}

TEST_F(WriteRequests, ReadTheEncodingBeforeTheContent) {
    json::Object request = textRequest(path, "text");
    request["encoding"] = true;
    request["content"] = 1.0;
    takeBusLog();
    EXPECT_THAT(send(request), IsEmpty());
    EXPECT_THAT(takeBusLog(), ElementsAre(HasSubstr("invalid conversion: boolean to string")));
}

TEST_F(WriteRequests, ReadTheirKeysInOrder) {
    const auto failureOf = [this](const json::Object& request) {
        takeBusLog();
        EXPECT_THAT(send(request), IsEmpty());
        const std::vector<std::string> log = takeBusLog();
        return log.empty() ? "no failure" : log.back();
    };
    json::Object request;
    request["contentType"] = true;
    request["filePath"] = 1.0;
    EXPECT_THAT(failureOf(request), HasSubstr("undefined to string"));
    request["rtcId"] = "1";
    EXPECT_THAT(failureOf(request), HasSubstr("boolean to string"));
    request["contentType"] = "text/plain";
    EXPECT_THAT(failureOf(request), HasSubstr("double to string"));
    request["filePath"] = path;
    EXPECT_THAT(failureOf(request), HasSubstr("undefined to string"));  // the encoding
    request["encoding"] = "UTF-8";
    request["content"] = json::Null();
    EXPECT_THAT(failureOf(request), HasSubstr("null to string"));
    request["contentType"] = "text/xml";
    EXPECT_THAT(failureOf(request), HasSubstr("null to object"));
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(WriteRequests, StorePartsWhoseBytesAreNoTextOnlyUnderATypeThatSaysSo) {
    const std::string bytes("\xD0\xCF\x11\xE0\0\x01\x7F", 7);
    const auto document = [&bytes](const char* type) {
        json::Object part{{"partUri", "/macros.bin"}, {"contentType", type}, {"content", bytes}};
        part["relationship"] = json::Null();
        return json::Object{{"parts", json::Array{std::move(part)}},
                            {"relationships", json::Array()}};
    };
    writeFile(path, "old");
    EXPECT_THAT(send(packageRequest(path, document("application/vnd.example.macros"))),
                ElementsAre(notification(path, true), answer(false)));
    EXPECT_EQ(readFile(path), "old");

    EXPECT_THAT(send(packageRequest(path, document("Application/vnd.example.macros"))),
                ElementsAre(notification(path, true), answer(true)));
    const std::vector<Message> answers = bundle.read(path, "text/xml");
    ASSERT_EQ(answers.size(), 1u);
    const json::Object part =
        json::parse(answers[0].payload)["parts"].get<json::Array>().at(0).get<json::Object>();
    EXPECT_EQ(part.at("content").get<std::string>(), bytes);
    EXPECT_EQ(part.at("contentType").get<std::string>(), "application/vnd.example.macros");
}

}  // namespace
