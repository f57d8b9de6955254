// SPDX-License-Identifier: Apache-2.0
// The bundle behind the guard with the file service beside it, on threads that are confined to a
// folder where the kernel can do that: what clients learn, and what they cannot reach.
#include "host/files/file_service.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <filesystem>
#include <limits>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "framework/bundle_runner.h"
#include "host/bus/forwarding_client.h"
#include "host/guard/document_version.h"
#include "host/guard/guarded_client.h"
#include "host/limits/confinement.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "tests/support/bundle_on_bus.h"
#include "tests/support/more_memory.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using platform::messaging::JsonMessage;
using test::readFile;
using test::writeFile;
using testing::ElementsAre;

// What clients of the bus are told of its limits, and what they ask for.
struct Limits {
    std::size_t longestRead = std::numeric_limits<std::size_t>::max();
    std::size_t longestFileAnswer = std::numeric_limits<std::size_t>::max();
    std::atomic<std::size_t> awaited = 0;
};

class LimitedClient final : public host::ForwardingClient {
public:
    LimitedClient(std::shared_ptr<platform::messaging::MessageService> client, Limits& limits)
        : ForwardingClient(std::move(client)), limits_(limits) {}

    std::size_t maxPayload(const std::string& channel) const override {
        return channel.starts_with(platform::messaging::filesResponsePrefix)
                   ? limits_.longestFileAnswer
                   : limits_.longestRead;
    }

    void awaitMemory(std::size_t bytes) override { limits_.awaited += bytes; }

private:
    Limits& limits_;
};

class FileServiceTest : public testing::Test {
protected:
    void SetUp() override {
        fs::create_directory(root_);
        fs::create_directory(outside_);
        writeFile(outside_ / "secret.txt", "secret");
        host::GuardOptions options;
        options.folder = state_;
        guard_ = host::makeGuard(options, {root_});
        // What is loaded later would not be found.
        ASSERT_NE(::dlopen(SERIALIZATION_BUNDLE, RTLD_NOW | RTLD_LOCAL), nullptr);
        std::thread([this] { start(); }).join();
        observation_ = bundle_->bus().observe([this](std::string_view, const JsonMessage& message) {
            const std::lock_guard lock(mutex_);
            published_.emplace_back(message.channel(), message.payload());
        });
    }

    void start() {
        if (!host::whyConfinementIsUnavailable()) {
            host::Confinement({{root_}, {SERIALIZATION_BUNDLE}}).confineThisThread();
        }
        bundle_.emplace(
            [](const JsonMessage&) {},  // the file service's messages are wanted as well
            test::BundleOnBus<framework::BundleRunner>::Setup{
                .bus = {.concurrentChannels = {platform::messaging::filesRequestChannel}},
                .wrapClient =
                    [this](std::shared_ptr<platform::messaging::MessageService> client) {
                        return host::savingSafely(
                            std::make_shared<LimitedClient>(std::move(client), limits_), guard_);
                    }},
            SERIALIZATION_BUNDLE);
        service_ = std::make_unique<host::FileService>(
            std::make_shared<LimitedClient>(bundle_->bus().connect("files").get(), limits_), guard_,
            std::vector<fs::path>{root_, outside_});
    }

    // The payload of the last message on a channel that begins like this, after a request.
    std::string send(const char* channel, json::Object request, std::string_view answers) {
        request.try_emplace("rtcId", "1");
        bundle_->sendAndWait(channel, json::serialize(json::Value(std::move(request))));
        const std::lock_guard lock(mutex_);
        std::string answer = "none";
        for (const auto& [on, payload] : std::exchange(published_, {})) {
            answer = on.starts_with(answers) ? payload : answer;
        }
        return answer;
    }

    json::Object ask(const std::string& operation, const fs::path& path, json::Object more = {}) {
        more["operation"] = operation;
        more["filePath"] = path.string();
        return json::parse(send(platform::messaging::filesRequestChannel, std::move(more),
                                platform::messaging::filesResponsePrefix));
    }

    std::string write(const fs::path& path, const std::string& text) {
        return send(platform::messaging::writeRequestChannel,
                    {{"contentType", "text/plain"},
                     {"encoding", "UTF-8"},
                     {"filePath", path.string()},
                     {"content", text}},
                    platform::messaging::writeResponsePrefix);
    }

    json::Array versionsOf(const fs::path& path) {
        guard_.history->waitUntilIdle();
        return ask("versions", path)["versions"].get<json::Array>();
    }

    const test::TemporaryDirectory scratch_;
    const fs::path root_ = scratch_ / "root";
    const fs::path outside_ = scratch_ / "outside";
    const fs::path state_ = scratch_ / "state";
    Limits limits_;
    host::Guard guard_;
    std::mutex mutex_;
    std::vector<std::pair<std::string, std::string>> published_;  // guarded by mutex_
    std::optional<test::BundleOnBus<framework::BundleRunner>> bundle_;
    std::shared_ptr<platform::messaging::Subscription> observation_;
    std::unique_ptr<host::FileService> service_;
};

TEST_F(FileServiceTest, TellsTheRoots) {
    json::Object answer = ask("roots", "");
    EXPECT_EQ(answer["status"], json::Value(true));
    EXPECT_EQ(answer["roots"], json::Value(json::Array{root_.string(), outside_.string()}));
}

TEST_F(FileServiceTest, ListsAFolderInTheOrderOfItsNames) {
    fs::create_directory(root_ / "b");
    writeFile(root_ / "a.txt", "12345");
    fs::create_symlink("a.txt", root_ / "c");
    ::symlink("none", (root_ / "d").c_str());
    writeFile(root_ / ".~saving-0123456789abcdef.tmp", "");
    json::Object answer = ask("list", root_);
    EXPECT_EQ(answer["status"], json::Value(true));
    EXPECT_EQ(answer["isLast"], json::Value(true));
    std::vector<std::string> entries;
    for (json::Value& entry : answer["entries"].get<json::Array>()) {
        auto& members = entry.get<json::Object>();
        entries.push_back(
            members["name"].get<std::string>() + " " + members["kind"].get<std::string>() +
            (members["kind"] == json::Value("file") ? " " + json::serialize(members["size"]) : ""));
        EXPECT_EQ(members["time"].get<double>() > 1.6e12, members["kind"] != json::Value("other"));
    }
    EXPECT_THAT(entries, ElementsAre("a.txt file 5", "b folder", "c file 5", "d other"));
}

TEST_F(FileServiceTest, ListsALargeFolderInPagesThatHaveEachEntryOnce) {
    constexpr int count = 2500;
    for (int i = 0; i < count; ++i) {
        writeFile(root_ / std::to_string(i), "");
    }
    std::vector<std::string> names;
    std::string after;
    for (bool isLast = false; !isLast;) {
        json::Object page = ask("list", root_, {{"after", after}});
        for (json::Value& entry : page["entries"].get<json::Array>()) {
            names.push_back(entry.get<json::Object>()["name"].get<std::string>());
        }
        isLast = page["isLast"] == json::Value(true);
        ASSERT_GT(names.back(), after);
        after = names.back();
    }
    EXPECT_EQ(names.size(), std::size_t{count});
    EXPECT_TRUE(std::is_sorted(names.begin(), names.end()));
}

TEST_F(FileServiceTest, NamesTheCharsetAndTellsOfTheMark) {
    writeFile(root_ / "plain.txt", "text");
    writeFile(root_ / "marked.txt", "\xEF\xBB\xBFtext");
    writeFile(root_ / "wide.txt", std::string("\xFF\xFEt\0e\0x\0t\0", 10));
    EXPECT_EQ(ask("charset", root_ / "plain.txt"),
              json::parse(R"({"byteOrderMark":false,"charset":"UTF-8","status":true})"));
    EXPECT_EQ(ask("charset", root_ / "marked.txt")["byteOrderMark"], json::Value(true));
    EXPECT_EQ(ask("charset", root_ / "wide.txt")["byteOrderMark"], json::Value(true));
    EXPECT_EQ(ask("charset", root_ / "none.txt")["status"], json::Value(false));
}

TEST_F(FileServiceTest, GivesTheVersionThatASaveCanBeBasedOn) {
    EXPECT_EQ(ask("version", root_ / "a.txt")["version"], json::Value(""));
    writeFile(root_ / "a.txt", "one");
    EXPECT_EQ(ask("version", root_ / "a.txt")["version"], json::Value(host::digestOf("one")));
}

TEST_F(FileServiceTest, ReadsAndRestoresEarlierVersions) {
    EXPECT_EQ(write(root_ / "a.txt", "one"), "true");
    EXPECT_EQ(write(root_ / "a.txt", "two"), "true");
    json::Array versions = versionsOf(root_ / "a.txt");
    ASSERT_EQ(versions.size(), 1U);
    const json::Value time = versions[0].get<json::Object>()["time"];
    EXPECT_EQ(versions[0].get<json::Object>()["size"], json::Value(3.0));
    EXPECT_EQ(ask("readVersion", root_ / "a.txt", {{"time", time}, {"contentType", "text/plain"}}),
              json::parse(R"({"data":"one","status":true})"));
    EXPECT_EQ(ask("restore", root_ / "a.txt", {{"time", time}}), json::parse(R"({"status":true})"));
    EXPECT_EQ(readFile(root_ / "a.txt"), "one");
    EXPECT_EQ(versionsOf(root_ / "a.txt").size(), 2U);
}

TEST_F(FileServiceTest, NamesTheCharsetOfAnEarlierVersion) {
    writeFile(root_ / "a.txt", std::string("\xFE\xFF\0a", 4));
    EXPECT_EQ(write(root_ / "a.txt", "a"), "true");
    const json::Value time = versionsOf(root_ / "a.txt").at(0).get<json::Object>()["time"];
    EXPECT_EQ(ask("charset", root_ / "a.txt"),
              json::parse(R"({"byteOrderMark":false,"charset":"UTF-8","status":true})"));
    EXPECT_EQ(ask("charset", root_ / "a.txt", {{"time", time}}),
              json::parse(R"({"byteOrderMark":true,"charset":"UTF-16BE","status":true})"));
}

// The answer goes to whoever asked the file service, and may be as long as that one takes it.
TEST_F(FileServiceTest, HoldsAnEarlierVersionToTheLengthOfItsOwnAnswers) {
    const std::string text(1000, 'x');
    write(root_ / "a.txt", text);
    write(root_ / "a.txt", "new");
    const json::Value time = versionsOf(root_ / "a.txt")[0].get<json::Object>()["time"];
    const auto read = [&] {
        return ask("readVersion", root_ / "a.txt", {{"time", time}, {"contentType", "text/plain"}});
    };
    limits_.longestRead = 100;
    EXPECT_EQ(read()["data"], json::Value(text));
    limits_.longestFileAnswer = 100;
    EXPECT_EQ(read()["exception"],
              json::Value("The document is too large: its message would be longer than the 100 "
                          "bytes that can be sent"));
}

// The copy that the bundle reads would otherwise take more than the process may.
TEST_F(FileServiceTest, ReadsNoEarlierVersionForWhichThereIsNoMemory) {
    write(root_ / "a.txt", "one");
    write(root_ / "a.txt", "two");
    const json::Value time = versionsOf(root_ / "a.txt").at(0).get<json::Object>()["time"];
    fs::path version;
    for (const auto& entry : fs::recursive_directory_iterator(state_ / "versions")) {
        version = entry.path();  // the only file is the last
    }
    // Versions have their size at the end of their names.
    const std::string name = version.string();
    ASSERT_TRUE(name.ends_with("-3")) << name;
    fs::resize_file(version, 10'000'000'000);
    fs::rename(version, name.substr(0, name.size() - 1) + "10000000000");
    const test::MoreMemory limited(1'000'000'000);
    EXPECT_EQ(ask("readVersion", root_ / "a.txt", {{"time", time}, {"contentType", "text/plain"}}),
              json::parse(R"({"exception":"cannot be kept in memory: Cannot allocate memory",)"
                          R"("status":false})"));
}

TEST_F(FileServiceTest, AsksForTheMemoryThatCopiesOfFilesTake) {
    writeFile(root_ / "a.txt", std::string(100'000, 'x'));
    fs::create_hard_link(root_ / "a.txt", root_ / "b.txt");  // so that it is written in place
    EXPECT_EQ(write(root_ / "a.txt", std::string(50'000, 'y')), "true");
    EXPECT_GE(limits_.awaited, 150'000U);
    EXPECT_LT(limits_.awaited, 160'000U);
    const json::Value time = versionsOf(root_ / "a.txt").at(0).get<json::Object>()["time"];
    limits_.awaited = 0;
    ask("readVersion", root_ / "a.txt", {{"time", time}, {"contentType", "text/xml"}});
    EXPECT_EQ(limits_.awaited, 100'000U);  // It is no package, so that the bundle asks for none.
}

TEST_F(FileServiceTest, AsksForTheMemoryThatRestoringInPlaceTakes) {
    writeFile(root_ / "a.txt", "one");
    EXPECT_EQ(write(root_ / "a.txt", std::string(100'000, 'x')), "true");
    const json::Value time = versionsOf(root_ / "a.txt").at(0).get<json::Object>()["time"];
    fs::create_hard_link(root_ / "a.txt", root_ / "b.txt");
    limits_.awaited = 0;
    EXPECT_EQ(ask("restore", root_ / "a.txt", {{"time", time}}), json::parse(R"({"status":true})"));
    EXPECT_EQ(readFile(root_ / "b.txt"), "one");
    EXPECT_EQ(limits_.awaited, 100'000U);
}

TEST_F(FileServiceTest, HasOneCopyOfAnEarlierVersionAtATime) {
    write(root_ / "a.txt", "one");
    write(root_ / "a.txt", "two");
    const json::Value time = versionsOf(root_ / "a.txt").at(0).get<json::Object>()["time"];
    std::atomic<int> begun = 0;
    std::atomic<int> copies = 0;
    std::atomic<bool> hadSeveral = false;
    *guard_.read = [&](const JsonMessage&) {
        ++begun;
        if (++copies > 1) {
            hadSeveral = true;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
        --copies;
    };
    const std::string request =
        json::serialize(json::Value(json::Object{{"rtcId", "1"},
                                                 {"operation", "readVersion"},
                                                 {"filePath", (root_ / "a.txt").string()},
                                                 {"contentType", "text/plain"},
                                                 {"time", time}}));
    for (int i = 0; i < 4; ++i) {
        bundle_->send(platform::messaging::filesRequestChannel,
                      platform::DataBuffer::copyOf(request));
    }
    bundle_->bus().waitUntilIdle();
    EXPECT_EQ(begun, 4);
    EXPECT_FALSE(hadSeveral);
}

TEST_F(FileServiceTest, ComputesNoVersionOfWhatIsTooLongForADocument) {
    writeFile(root_ / "a.txt", "");
    fs::resize_file(root_ / "a.txt", 10'000'000'000'000);
    EXPECT_EQ(ask("version", root_ / "a.txt")["exception"],
              json::Value("is too large for a document: 10000000000000 bytes"));
    EXPECT_EQ(send(platform::messaging::writeRequestChannel,
                   {{"filePath", (root_ / "a.txt").string()},
                    {"contentType", "text/plain"},
                    {"encoding", "UTF-8"},
                    {"content", "text"},
                    {"baseVersion", "another"}},
                   platform::messaging::writeResponsePrefix),
              "false");
}

TEST_F(FileServiceTest, AsksForTheMemoryThatATextTakesBeforeItFindsItsCharset) {
    writeFile(root_ / "a.txt", std::string(100'000, 'x'));
    ask("charset", root_ / "a.txt");
    EXPECT_GE(limits_.awaited, 100'000U);
}

// To be opened once, even for a moment, lets a writer go on, whose text is then lost.
TEST_F(FileServiceTest, DoesNotOpenAPipe) {
    const fs::path pipe = root_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    std::atomic<bool> hasReader = false;
    std::thread writer([&] {
        const platform::FileDescriptor opened(::open(pipe.c_str(), O_WRONLY | O_CLOEXEC));
        hasReader = true;
    });
    for (int i = 0; i < 20; ++i) {
        for (const char* operation : {"version", "charset"}) {
            EXPECT_EQ(ask(operation, pipe)["exception"], json::Value("It is not a regular file"));
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));  // time for the writer to wait
    }
    EXPECT_FALSE(hasReader);
    const platform::FileDescriptor reader(::open(pipe.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    writer.join();
}

TEST_F(FileServiceTest, TellsOfTheRestoredFile) {
    write(root_ / "a.txt", "one");
    write(root_ / "a.txt", "two");
    const json::Value time = versionsOf(root_ / "a.txt")[0].get<json::Object>()["time"];
    EXPECT_EQ(
        json::parse(send(
            platform::messaging::filesRequestChannel,
            {{"operation", "restore"}, {"filePath", (root_ / "a.txt").string()}, {"time", time}},
            platform::messaging::notificationChannel))["isExistingFile"],
        json::Value(true));
}

TEST_F(FileServiceTest, SaysWhatIsWrongWithARequest) {
    for (json::Object request : {
             json::Object{{"operation", "none"}, {"filePath", "/"}},
             json::Object{{"filePath", "/"}},
             json::Object{{"operation", "list"}},
             json::Object{{"operation", "list"}, {"filePath", std::string("/\0", 2)}},
             json::Object{{"operation", "versions"}, {"filePath", std::string(PATH_MAX, '/')}},
             json::Object{
                 {"operation", "restore"}, {"filePath", (root_ / "a.txt").string()}, {"time", 1.0}},
             json::Object{{"operation", "restore"},
                          {"filePath", (root_ / "a.txt").string()},
                          {"time", -1.0}},
             json::Object{{"operation", "version"}, {"filePath", root_.string()}},
         }) {
        json::Object answer = json::parse(send(platform::messaging::filesRequestChannel, request,
                                               platform::messaging::filesResponsePrefix));
        EXPECT_EQ(answer["status"], json::Value(false)) << json::serialize(json::Value(request));
        EXPECT_NE(answer["exception"], json::Value(""));
    }
}

TEST_F(FileServiceTest, ShowsAndChangesNothingOutsideItsRoot) {
    if (host::whyConfinementIsUnavailable()) {
        GTEST_SKIP() << "this kernel cannot confine threads";
    }
    double time = 0;
    {
        host::GuardOptions options;
        options.folder = state_;
        const host::Guard other = host::makeGuard(options, {outside_});
        const std::string document = host::History::nameOf(outside_ / "secret.txt");
        other.history->keep(
            platform::FileDescriptor(::open((outside_ / "secret.txt").c_str(), O_RDONLY)),
            document);
        time = static_cast<double>(other.history->versionsOf(document).at(0).time);
    }
    fs::create_directory_symlink(outside_, root_ / "link");
    for (const fs::path& folder : {outside_, root_ / "link", root_ / "../outside"}) {
        EXPECT_EQ(ask("list", folder)["status"], json::Value(false));
        EXPECT_EQ(ask("version", folder / "secret.txt")["status"], json::Value(false));
        EXPECT_EQ(ask("charset", folder / "secret.txt")["status"], json::Value(false));
        EXPECT_EQ(ask("versions", folder / "secret.txt")["status"], json::Value(false));
        const json::Object version{{"time", time}, {"contentType", "text/plain"}};
        EXPECT_EQ(ask("readVersion", folder / "secret.txt", version)["status"], json::Value(false));
        EXPECT_EQ(ask("charset", folder / "secret.txt", version)["status"], json::Value(false));
        EXPECT_EQ(ask("restore", folder / "secret.txt", version)["status"], json::Value(false));
        EXPECT_EQ(ask("restore", root_ / "secret.txt", version)["status"], json::Value(false));
        EXPECT_EQ(write(folder / "secret.txt", "x"), "false");
        EXPECT_EQ(write(folder / "new.txt", "x"), "false");
    }
    EXPECT_EQ(ask("list", state_)["status"], json::Value(false));
    EXPECT_EQ(readFile(outside_ / "secret.txt"), "secret");
    EXPECT_FALSE(fs::exists(outside_ / "new.txt"));
    // What the process holds open of the state is closed to clients too.
    for (const auto& entry : fs::directory_iterator("/proc/self/fd")) {
        std::error_code ignored;
        if (fs::read_symlink(entry, ignored).string().starts_with(state_.string())) {
            EXPECT_EQ(write(entry.path(), "x"), "false") << entry;
        }
    }
}

TEST_F(FileServiceTest, SavesWithinItsRootWhileConfined) {
    EXPECT_EQ(write(root_ / "a.txt", "one"), "true");
    fs::create_hard_link(root_ / "a.txt", root_ / "b.txt");
    EXPECT_EQ(write(root_ / "a.txt", "two"), "true");
    EXPECT_EQ(readFile(root_ / "b.txt"), "two");
    EXPECT_EQ(versionsOf(root_ / "a.txt").size(), 1U);
}

}  // namespace
