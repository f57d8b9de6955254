// SPDX-License-Identifier: Apache-2.0
// The bundle in the framework that this build has.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "framework/bundle_runner.h"
#include "platform/messaging/channels.h"
#include "tests/serialization/activator/watched_messaging.h"
#include "tests/support/process_state.h"

namespace {

using framework::BundleRunner;
using test::WatchedMessaging;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class BundleInFrameworkTest : public testing::Test {
protected:
    std::vector<std::string> answersToRead() {
        return messaging_.publish(
            platform::messaging::readRequestChannel,
            R"({"rtcId":"r","contentType":"text/plain","filePath":"/dev/null"})");
    }

    WatchedMessaging messaging_;
};

TEST_F(BundleInFrameworkTest, AnswersRequestsUntilItIsStopped) {
    BundleRunner runner(BUNDLE);
    EXPECT_THAT(answersToRead(),
                ElementsAre(R"(/zpr/service/readResponse/r {"data":"","status":true})"));
    runner.stop();
    EXPECT_THAT(answersToRead(), IsEmpty());
}

TEST_F(BundleInFrameworkTest, FailsToStartWithTheTextOfTheMessageService) {
    messaging_.createWith([](const std::string&, const platform::messaging::MessageServiceOptions&)
                              -> WatchedMessaging::Created { throw std::runtime_error("no bus"); });
    try {
        const BundleRunner runner(BUNDLE);
        ADD_FAILURE() << "the bundle starts";
    } catch (const std::runtime_error& error) {
        EXPECT_THAT(error.what(), HasSubstr("no bus"));
    }
}

#ifdef BUNDLES_ARE_UNLOADED
TEST_F(BundleInFrameworkTest, LeavesTheProcessInTheEnd) {
    {
        const BundleRunner runner(BUNDLE);
        answersToRead();
        ASSERT_TRUE(test::isLoaded(BUNDLE));
    }
    EXPECT_FALSE(test::isLoaded(BUNDLE));
}
#endif

}  // namespace
