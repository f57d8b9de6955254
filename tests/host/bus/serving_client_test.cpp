// SPDX-License-Identifier: Apache-2.0
#include "host/bus/serving_client.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <spdlog/sinks/ostream_sink.h>
#include <spdlog/spdlog.h>

#include <cstddef>
#include <filesystem>
#include <future>
#include <memory>
#include <mutex>
#include <set>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>

#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using host::ServingOptions;
using platform::DataBuffer;
using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using platform::messaging::Subscription;
using platform::messaging::writeRequestChannel;
using platform::messaging::writeResponsePrefix;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// What is logged while this object lives.
class Log {
public:
    Log() : previous_(spdlog::default_logger()) {
        spdlog::set_default_logger(std::make_shared<spdlog::logger>(
            "test", std::make_shared<spdlog::sinks::ostream_sink_mt>(text_)));
    }
    Log(const Log&) = delete;
    Log& operator=(const Log&) = delete;
    ~Log() { spdlog::set_default_logger(previous_); }

    std::string text() const { return text_.str(); }

private:
    std::ostringstream text_;
    std::shared_ptr<spdlog::logger> previous_;
};

// A bus on which somebody answers each request with the same text.
class Serving : public ::testing::Test {
protected:
    Serving() {
        fs::create_directory(inside());
        fs::create_directory(outside());
        options_.roots = {inside()};
    }

    fs::path inside() const { return folder_ / "inside"; }
    fs::path outside() const { return folder_ / "outside"; }

    // What is logged when a request for `path` gets `answer`.
    std::string logOf(const std::string& requestChannel, const std::string& responsePrefix,
                      const std::string& path, const std::string& answer) {
        const Log log;
        const std::shared_ptr<InProcessBus> bus = InProcessBus::create({});
        const auto client = host::servingClient(bus->connect("server").get(), options_);
        const auto subscription =
            client
                ->subscribe(
                    requestChannel,
                    [&](const JsonMessage&) {
                        client->publish(responsePrefix + "1", DataBuffer::copyOf(answer)).get();
                    })
                .get();
        bus->connect("client").get()->publish(
            requestChannel, DataBuffer::copyOf(R"({"rtcId":"1","filePath":")" + path + R"("})"));
        bus->waitUntilIdle();
        return log.text();
    }

    std::string logOfRead(const std::string& path,
                          const std::string& answer = R"({"data":"","status":true})") {
        return logOf(readRequestChannel, readResponsePrefix, path, answer);
    }

    std::string logOfWrite(const std::string& path, const std::string& answer) {
        return logOf(writeRequestChannel, writeResponsePrefix, path, answer);
    }

    ServingOptions options_;

private:
    const test::TemporaryDirectory folder_;
};

TEST_F(Serving, LogsRefusedPathsOutsideOfTheRoots) {
    fs::create_directory_symlink(outside(), inside() / "link");
    for (const std::string path :
         {outside() / "file", inside() / "../outside/file", inside() / "link/file",
          fs::path(inside().string() + "2/file"), fs::path("/etc/hostname"), fs::path("file")}) {
        EXPECT_THAT(logOfRead(path), AllOf(HasSubstr("refused " + path), HasSubstr("--root")));
        EXPECT_THAT(logOfWrite(path, "false"), HasSubstr("refused " + path));
    }
}

TEST_F(Serving, LogsNoOthers) {
    fs::create_directory_symlink(inside(), outside() / "link");
    for (const fs::path& path : {inside() / "file", inside() / "new/file",
                                 inside() / "../inside/file", inside(), outside() / "link/file"}) {
        EXPECT_THAT(logOfRead(path), IsEmpty()) << path;
        EXPECT_THAT(logOfWrite(path, "false"), IsEmpty()) << path;
    }
    EXPECT_THAT(logOfWrite(outside() / "file", "true"), IsEmpty());
    EXPECT_THAT(logOfRead(outside() / "file", std::string(10'000, 'x')), IsEmpty());
    EXPECT_THAT(logOfRead(""), IsEmpty());
    EXPECT_THAT(logOfRead(std::string(PATH_MAX, '/')), IsEmpty());
    options_.roots.clear();
    EXPECT_THAT(logOfRead(outside() / "file"), IsEmpty());
}

TEST_F(Serving, FollowsRootsThatAreLinks) {
    fs::create_directory_symlink(inside(), outside() / "link");
    options_.roots = {outside() / "link"};
    EXPECT_THAT(logOfRead(inside() / "file"), IsEmpty());
    EXPECT_THAT(logOfRead(outside() / "file"), HasSubstr("refused"));
}

TEST_F(Serving, CountsRequestsByTheirAnswers) {
    const std::string file = inside() / "file";
    logOfRead(file, R"({"data":"\"status\":false","status":true})");
    logOfRead(file, R"({"exception":"no","status":false,"version":""})");
    logOfRead(file, std::string(10'000, 'x'));
    logOfWrite(file, "true");
    logOfWrite(file, "false");
    logOf(writeRequestChannel, "elsewhere/", file, "true");
    logOf("questions of another kind", writeResponsePrefix, file, "false");
    const std::string text = options_.metrics->text();
    for (const char* line :
         {"kind=\"read\",outcome=\"success\"} 2\n", "kind=\"read\",outcome=\"failure\"} 1\n",
          "kind=\"read\",outcome=\"no_answer\"} 0\n", "kind=\"write\",outcome=\"success\"} 1\n",
          "kind=\"write\",outcome=\"failure\"} 1\n", "kind=\"write\",outcome=\"no_answer\"} 1\n",
          "editor_requests_under_way{kind=\"read\"} 0\n",
          "editor_answer_bytes_total{kind=\"write\"} 9\n"}) {
        EXPECT_THAT(text, HasSubstr(line));
    }
}

TEST_F(Serving, PreparesEachThreadOnceBeforeItsFirstMessage) {
    std::mutex mutex;
    std::multiset<std::thread::id> prepared;
    options_.prepareThread = [&] {
        const std::lock_guard lock(mutex);
        prepared.insert(std::this_thread::get_id());
    };
    const std::shared_ptr<InProcessBus> bus = InProcessBus::create({});
    const auto client = host::servingClient(bus->connect("server").get(), options_);
    std::set<std::thread::id> handling;
    const MessageHandler handler = [&](const JsonMessage&) {
        const std::lock_guard lock(mutex);
        EXPECT_EQ(prepared.count(std::this_thread::get_id()), 1U);
        handling.insert(std::this_thread::get_id());
    };
    const auto reads = client->subscribe(readRequestChannel, handler).get();
    const auto writes = client->subscribe(writeRequestChannel, handler).get();
    for (int count = 0; count < 3; ++count) {
        client->publish(readRequestChannel, DataBuffer::copyOf("{}"));
        client->publish(writeRequestChannel, DataBuffer::copyOf("{}"));
        bus->waitUntilIdle();
    }
    EXPECT_EQ(handling.size(), 2U);
    EXPECT_EQ(prepared.size(), 2U);
}

TEST_F(Serving, NoMessageIsHandledOnAThreadThatCannotBePrepared) {
    options_.prepareThread = [] { throw std::runtime_error("no"); };
    const std::shared_ptr<InProcessBus> bus = InProcessBus::create({});
    const auto client = host::servingClient(bus->connect("server").get(), options_);
    int handled = 0;
    const auto subscription =
        client->subscribe(readRequestChannel, [&](const JsonMessage&) { ++handled; }).get();
    for (int count = 0; count < 3; ++count) {
        client->publish(readRequestChannel, DataBuffer::copyOf("{}"));
    }
    bus->waitUntilIdle();
    EXPECT_EQ(handled, 0);
}

// A client that may not subscribe.
class RefusedClient final : public MessageService {
public:
    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string&,
                                                             MessageHandler) override {
        throw std::runtime_error("not permitted");
    }
    futures::Future<void> publish(const std::string&, DataBuffer) override {
        throw std::runtime_error("not permitted");
    }
    std::size_t maxPayload(const std::string&) const override { return 1234; }
};

TEST_F(Serving, TakesMessagesAsLongAsItsClientDoes) {
    const auto client = host::servingClient(std::make_shared<RefusedClient>(), options_);
    EXPECT_EQ(client->maxPayload(std::string(readResponsePrefix) + "1"), 1234U);
}

TEST_F(Serving, TellsWhyThereIsNoSubscription) {
    const auto client = host::servingClient(std::make_shared<RefusedClient>(), options_);
    EXPECT_NO_THROW(options_.subscriptionFailure->check());
    auto subscription = client->subscribe(readRequestChannel, [](const JsonMessage&) {});
    EXPECT_THROW(subscription.get(), std::runtime_error);
    try {
        options_.subscriptionFailure->check();
        FAIL() << "no failure is told";
    } catch (const std::runtime_error& error) {
        EXPECT_EQ(std::string(error.what()), "the bundle gets no requests: not permitted");
    }
}

}  // namespace
