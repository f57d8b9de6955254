// Write requests through the loaded bundle and the bus.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::kNotifications;
using test::kWriteRequests;
using test::Message;
using test::readFile;
using test::writeFile;
using testing::ElementsAre;
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
        return bundle.send(kWriteRequests, json::serialize(json::Value(request)));
    }

    static Message notification(const std::string& path, bool existed) {
        return {kNotifications, R"({"filePath":)" + json::serialize(json::Value(path)) +
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
        EXPECT_THAT(bundle.send(kWriteRequests, request), IsEmpty()) << request;
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

}  // namespace
