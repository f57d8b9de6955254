// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_configuration.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace {

using host::NatsConfiguration;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

NatsConfiguration configuration() {
    NatsConfiguration result;
    result.runtimeFolder = "/run/folder";
    result.users = {{"worker", "w"}, {"editor", "e"}};
    return result;
}

TEST(NatsConfiguration, IsForThisMachineOnly) {
    const std::string text = configurationText(configuration());
    EXPECT_THAT(text, AllOf(HasSubstr("host: \"127.0.0.1\"\nport: -1\n"),
                            HasSubstr("websocket {\n  host: \"127.0.0.1\"\n  port: -1\n")));
}

TEST(NatsConfiguration, HasThePortsThatAreAskedFor) {
    NatsConfiguration options = configuration();
    options.port = 4222;
    options.webSocketPort = 9222;
    EXPECT_THAT(configurationText(options),
                AllOf(HasSubstr("\nport: 4222\n"), HasSubstr("\n  port: 9222\n")));
}

TEST(NatsConfiguration, LetsEditorsAskAndHearTheirAnswersAndNothingElse) {
    EXPECT_THAT(configurationText(configuration()),
                HasSubstr("    {user: \"worker\", password: \"w\"}\n"
                          "    {user: \"editor\", password: \"e\", permissions: {\n"
                          "      publish: [\"/zpr/service/readRequest_cpp\", "
                          "\"/zpr/service/writeRequest_cpp\", "
                          "\"/zpr/service/filesRequest_host\", "
                          "\"/zpr/service/readRequest_cpp/offer\", "
                          "\"/zpr/service/writeRequest_cpp/offer\", "
                          "\"/zpr/service/filesRequest_host/offer\", "
                          "\"/zpr/service/piece.*.editor.>\"]\n"
                          "      subscribe: [\"/zpr/service/notifyFileSystemRequest\", "
                          "\"/zpr/service/readResponse/editor.>\", "
                          "\"/zpr/service/writeResponse/editor.>\", "
                          "\"/zpr/service/filesResponse/editor.>\"]\n"
                          "    }}\n"));
}

TEST(NatsConfiguration, LetsNoPageInUnlessItsOriginIsNamed) {
    NatsConfiguration options = configuration();
    EXPECT_THAT(configurationText(options),
                AllOf(HasSubstr("same_origin: true"), Not(HasSubstr("allowed_origins"))));
    options.allowedOrigins = {"http://a", "http://b:1"};
    EXPECT_THAT(configurationText(options),
                AllOf(HasSubstr("allowed_origins: [\"http://a\", \"http://b:1\"]\n"),
                      Not(HasSubstr("same_origin"))));
}

TEST(NatsConfiguration, QuotesTheNameOfTheFolder) {
    NatsConfiguration options = configuration();
    options.runtimeFolder = R"(/a "b\c)";
    EXPECT_THAT(configurationText(options), HasSubstr(R"(ports_file_dir: "/a \"b\\c")"));
}

TEST(Origin, IsASchemeAHostAndPerhapsAPort) {
    for (const char* origin : {"http://localhost", "https://editor.example.org",
                               "http://127.0.0.1:8080", "http://[::1]:65535"}) {
        EXPECT_TRUE(host::isOrigin(origin)) << origin;
    }
    for (const char* text : {"", "localhost:3000", "ws://localhost", "http://", "http://localhost/",
                             "http://a b", "http://LOCALHOST", "http://user@localhost",
                             "http://localhost:0", "http://localhost:65536", "http://localhost:",
                             "http://localhost\n", "http://a\"b", "null", "*"}) {
        EXPECT_FALSE(host::isOrigin(text)) << text;
    }
}

TEST(CommonHost, IsThatOfTwoOriginsThatDiffer) {
    EXPECT_EQ(host::commonHost({}), "");
    EXPECT_EQ(host::commonHost({"http://a:1", "http://b:1", "http://a:1"}), "");
    EXPECT_EQ(host::commonHost({"http://a:1", "http://b:1", "http://a:2"}), "a");
    EXPECT_EQ(host::commonHost({"http://b", "https://b"}), "b");
}

TEST(Password, IsLongAndAnotherEachTime) {
    const std::string password = host::makePassword();
    EXPECT_THAT(password, ::testing::MatchesRegex("[0-9a-f]+"));
    EXPECT_EQ(password.size(), 64U);
    EXPECT_NE(password, host::makePassword());
}

}  // namespace
