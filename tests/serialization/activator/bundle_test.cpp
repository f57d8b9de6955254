// SPDX-License-Identifier: Apache-2.0
// The bundle from its loading to its end, with real messages on an in-process bus.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <exception>
#include <filesystem>
#include <future>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "futures/future.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "tests/serialization/activator/loaded_bundle.h"
#include "tests/serialization/activator/watched_messaging.h"
#include "tests/support/source_root.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::messaging::MessageService;
using platform::messaging::MessageServiceOptions;
using testing::ElementsAre;
using testing::EndsWith;
using testing::IsEmpty;

using test::LoadedBundle;
using test::WatchedMessaging;
using Client = std::shared_ptr<MessageService>;
using Subscribed = WatchedMessaging::Subscribed;

const std::string readChannel = platform::messaging::readRequestChannel;
const std::string writeChannel = platform::messaging::writeRequestChannel;

template <typename T>
futures::Future<T> failed(const std::string& text) {
    futures::Promise<T> promise;
    promise.setException(std::make_exception_ptr(std::runtime_error(text)));
    return promise.getFuture();
}

class BundleTest : public testing::Test {
protected:
    BundleTest() { test::writeFile(document_, "a line"); }

    std::vector<std::string> answersToRead() {
        return messaging_.publish(readChannel,
                                  R"({"rtcId":"r","contentType":"text/plain","filePath":")" +
                                      document_.string() + R"("})");
    }

    // The text of the exception that Start throws.
    std::string startFailure() {
        try {
            bundle_.start();
        } catch (const std::runtime_error& error) {
            return error.what();
        }
        return "(the bundle starts)";
    }

    const test::TemporaryDirectory folder_;
    const std::filesystem::path document_ = folder_ / "document.txt";
    WatchedMessaging messaging_;
    LoadedBundle bundle_;
};

const auto oneAnswer =
    ElementsAre(R"(/zpr/service/readResponse/r {"data":"a line","status":true})");

TEST_F(BundleTest, DestroysNoActivatorWithoutEffect) {
    bundle_.start();
    bundle_.destroyNoActivator();
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, IsNoClientBeforeItIsStarted) {
    EXPECT_THAT(messaging_.events(), IsEmpty());
    EXPECT_THAT(answersToRead(), IsEmpty());
}

TEST_F(BundleTest, ConnectsAndSubscribesBothChannelsAtStart) {
    bundle_.start();
    EXPECT_THAT(messaging_.events(), ElementsAre("client 1", readChannel + " for client 1",
                                                 writeChannel + " for client 1"));
}

TEST_F(BundleTest, NamesItselfToTheMessageServiceAndGivesNoOptions) {
    std::string name;
    MessageServiceOptions options{{"left", "over"}};
    messaging_.createWith([&](const std::string& clientName, const MessageServiceOptions& given) {
        name = clientName;
        options = given;
        return failed<Client>("not today");
    });
    bundle_.start();
    EXPECT_EQ(name, "EditorSerialization");
    EXPECT_THAT(options, IsEmpty());
}

TEST_F(BundleTest, AnswersReadRequests) {
    bundle_.start();
    EXPECT_THAT(answersToRead(), oneAnswer);
}

// Detection and conversion bring in libraries with caches of their own, which outlast the bundle.
TEST_F(BundleTest, LosesNothingOfItsLibrariesWhenItIsUnloaded) {
    std::filesystem::copy_file(test::sourceRoot() + "/examples/library-notice.shift_jis.txt",
                               document_, std::filesystem::copy_options::overwrite_existing);
    bundle_.start();
    EXPECT_THAT(answersToRead(), ElementsAre(EndsWith(R"("status":true})")));
}

TEST_F(BundleTest, AnswersRequestsAfterStop) {
    bundle_.start();
    bundle_.stop();
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, StopsWithoutHavingBeenStarted) {
    bundle_.stop();
    EXPECT_THAT(messaging_.events(), IsEmpty());
}

TEST_F(BundleTest, DisconnectsWhenItsActivatorIsDestroyed) {
    bundle_.start();
    bundle_.stop();
    bundle_.destroyActivator();
    EXPECT_THAT(
        messaging_.events(),
        ElementsAre("client 1", readChannel + " for client 1", writeChannel + " for client 1",
                    "end of " + writeChannel + " for client 1",
                    "end of " + readChannel + " for client 1", "end of client 1"));
    EXPECT_THAT(answersToRead(), IsEmpty());
}

TEST_F(BundleTest, KeepsOnlyTheNewerServiceObjectOfTwoStarts) {
    bundle_.start();
    bundle_.start();
    EXPECT_THAT(
        messaging_.events(),
        ElementsAre("client 1", readChannel + " for client 1", writeChannel + " for client 1",
                    "client 2", readChannel + " for client 2", writeChannel + " for client 2",
                    "end of " + writeChannel + " for client 1",
                    "end of " + readChannel + " for client 1", "end of client 1"));
    EXPECT_THAT(answersToRead(), oneAnswer);
}

// Start-up that fails without a word: Start succeeds.

TEST_F(BundleTest, AnswersNothingWhenTheCreationResolvesWithAnException) {
    messaging_.createWith([](const std::string&, const MessageServiceOptions&) {
        return failed<Client>("no bus today");
    });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(answersToRead(), IsEmpty());
    EXPECT_NO_THROW(bundle_.stop());
}

TEST_F(BundleTest, AnswersNothingWhenTheCreationIsCancelled) {
    messaging_.createWith([](const std::string&, const MessageServiceOptions&) {
        return futures::Promise<Client>().getFuture();
    });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(answersToRead(), IsEmpty());
}

TEST_F(BundleTest, GivesUpOnWritingTooWhenTheReadSubscriptionFails) {
    messaging_.subscribeWith(readChannel, [](Subscribed) {
        return failed<std::shared_ptr<WatchedMessaging::Subscription>>("no reading");
    });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(messaging_.events(), ElementsAre("client 1", readChannel + " for client 1",
                                                 "end of " + readChannel + " for client 1"));
    EXPECT_THAT(answersToRead(), IsEmpty());
}

TEST_F(BundleTest, AnswersOnlyReadRequestsWhenTheWriteSubscriptionFails) {
    messaging_.subscribeWith(writeChannel, [](Subscribed) {
        return failed<std::shared_ptr<WatchedMessaging::Subscription>>("no writing");
    });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(messaging_.events(), ElementsAre("client 1", readChannel + " for client 1",
                                                 writeChannel + " for client 1",
                                                 "end of " + writeChannel + " for client 1"));
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, AnswersOnlyReadRequestsWhenTheWriteSubscriptionThrows) {
    messaging_.subscribeWith(
        writeChannel, [](Subscribed) -> Subscribed { throw std::runtime_error("no writing"); });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, AnswersOnlyReadRequestsWhenTheWriteSubscriptionIsNoFuture) {
    messaging_.subscribeWith(writeChannel, [](Subscribed) { return Subscribed(); });
    EXPECT_NO_THROW(bundle_.start());
    EXPECT_THAT(answersToRead(), oneAnswer);
}

// Start-up that the host sees fail.

TEST_F(BundleTest, FailsToStartWhenTheMessageServiceCannotBeCreated) {
    messaging_.createWith(
        [](const std::string&, const MessageServiceOptions&) -> futures::Future<Client> {
            throw std::runtime_error("no bus");
        });
    EXPECT_EQ(startFailure(), "no bus");
}

TEST_F(BundleTest, FailsToStartWhenTheCreationIsNoFuture) {
    messaging_.createWith(
        [](const std::string&, const MessageServiceOptions&) { return futures::Future<Client>(); });
    EXPECT_EQ(startFailure(), "Future state isn't valid!");
}

TEST_F(BundleTest, FailsToStartWhenTheCreationHasAContinuationAlready) {
    const auto state = std::make_shared<futures::detail::SharedFutureState<Client>>();
    futures::Future<Client>(state).then([](futures::Future<Client>) {});
    messaging_.createWith([state](const std::string&, const MessageServiceOptions&) {
        return futures::Future<Client>(state);
    });
    EXPECT_EQ(startFailure(),
              "Future already has returned it's value or has an associated continuation.");
}

TEST_F(BundleTest, KeepsItsServiceObjectWhenALaterStartFails) {
    bundle_.start();
    messaging_.createWith(
        [](const std::string&, const MessageServiceOptions&) -> futures::Future<Client> {
            throw std::runtime_error("no bus");
        });
    EXPECT_EQ(startFailure(), "no bus");
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, EndsCleanlyAfterAStartThatFailed) {
    messaging_.createWith(
        [](const std::string&, const MessageServiceOptions&) -> futures::Future<Client> {
            throw std::runtime_error("no bus");
        });
    EXPECT_EQ(startFailure(), "no bus");
    EXPECT_NO_THROW(bundle_.destroyActivator());
    EXPECT_THAT(answersToRead(), IsEmpty());
}

// Start-up that takes its time.

TEST_F(BundleTest, ConnectsOnTheThreadThatResolvesTheCreationLater) {
    futures::Promise<Client> creation;
    messaging_.createWith(
        [&](const std::string&, const MessageServiceOptions&) { return creation.getFuture(); });
    bundle_.start();
    EXPECT_THAT(answersToRead(), IsEmpty());

    std::thread([&] { creation.setValue(messaging_.connect("EditorSerialization")); }).join();
    EXPECT_THAT(answersToRead(), oneAnswer);
}

TEST_F(BundleTest, AnswersReadRequestsWhileItWaitsForTheWriteSubscription) {
    futures::Promise<Client> creation;
    messaging_.createWith(
        [&](const std::string&, const MessageServiceOptions&) { return creation.getFuture(); });
    std::promise<void> subscribesWriting;
    futures::Promise<std::shared_ptr<WatchedMessaging::Subscription>> writeSubscription;
    messaging_.subscribeWith(writeChannel, [&](Subscribed) {
        subscribesWriting.set_value();
        return writeSubscription.getFuture();
    });
    bundle_.start();

    std::thread resolver([&] { creation.setValue(messaging_.connect("EditorSerialization")); });
    subscribesWriting.get_future().wait();
    EXPECT_THAT(answersToRead(), oneAnswer);
    writeSubscription.setValue(nullptr);
    resolver.join();
    EXPECT_THAT(answersToRead(), oneAnswer);
}

}  // namespace
