// SPDX-License-Identifier: Apache-2.0
// What happens to each kind of request when any of the system calls along its way fails.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/syscall.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <exception>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/transport.h"
#include "serialization/serialization.h"
#include "tests/support/names_in.h"
#include "tests/support/process_state.h"
#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;
using test::readFile;
using testing::AnyOf;
using testing::ElementsAre;

constexpr std::array triedErrors = {EIO, ENOSPC, EACCES, ENOMEM, EMFILE, EINTR};

class SystemCallFaults : public testing::Test {
protected:
    using Handler = void (Serialization::*)(const JsonMessage&);

    void SetUp() override {
        // The heap of a thread of its own would now and then look at a file of the system's when it
        // shrinks, a call that is not the service's.
        ::mallopt(M_ARENA_MAX, 1);
        if (!test::canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
    }

    ~SystemCallFaults() override { platform::messaging::setTransport({}); }

    std::string request(const std::string& contentType, json::Value content = json::Null()) const {
        json::Object object{{"rtcId", "1"},
                            {"contentType", contentType},
                            {"filePath", path},
                            {"encoding", "UTF-8"}};
        object["content"] = std::move(content);
        return json::serialize(json::Value(std::move(object)));
    }

    static json::Value packageContent(const std::string& text) {
        return json::parse(R"({"v":{"parts":[{"partUri":"/a.xml","contentType":"application/xml",)"
                           R"("relationship":null,"content":")" +
                           text + R"("}],"relationships":[]}})")["v"];
    }

    /// What the service publishes when it handles `text`.
    std::vector<std::string> handle(Handler handler, const std::string& text) {
        published.clear();
        const JsonMessage message(
            std::make_shared<const std::string>("requests"),
            std::make_shared<const platform::DataBuffer>(platform::DataBuffer::copyOf(text)));
        try {
            (*service.*handler)(message);
        } catch (const std::exception& error) {
            published.push_back(std::string("thrown: ") + error.what());
        }
        return published;
    }

    /// Handles `text` once for each of its system calls and each of some errors, with which the
    /// call fails then. Each time calls `prepare` before, and `check` with what was published.
    void failEach(Handler handler, const std::string& text, const std::function<void()>& prepare,
                  const std::function<void(const std::vector<std::string>&)>& check) {
        prepare();
        handle(handler, text);  // what is done only once in a process is done now
        prepare();
        const std::vector<int> calls = test::callsOf([&] { handle(handler, text); });
        const std::size_t descriptors = test::openDescriptors();
        ASSERT_GT(calls.size(), 3u);
        int faults = 0;
        for (int failing = 0; failing < static_cast<int>(calls.size()); ++failing) {
            for (const int error : triedErrors) {
                SCOPED_TRACE("call " + std::to_string(failing) + ", system call " +
                             std::to_string(calls[static_cast<std::size_t>(failing)]) + ", errno " +
                             std::to_string(error));
                prepare();
                test::supervise([&] { handle(handler, text); },
                                [&](int, int index) {
                                    faults += index == failing ? 1 : 0;
                                    return index == failing ? error : 0;
                                });
                check(published);
                ASSERT_FALSE(HasFailure());
            }
        }
        // A close that fails here is not made; the system's own frees the descriptor all the same.
        const auto closes =
            static_cast<std::size_t>(std::count(calls.begin(), calls.end(), SYS_close));
        EXPECT_EQ(test::openDescriptors(), descriptors + closes * triedErrors.size());
        RecordProperty("faults", std::to_string(faults));
    }

    std::set<std::string> names() const { return test::namesIn(folder.path()); }

    test::TemporaryDirectory folder;
    const std::string path = (folder / "document").string();
    const std::string notification = R"({"filePath":")" + path + R"(","isExistingFile":true})";
    std::vector<std::string> published;  // payloads, by the handling thread

private:
    std::shared_ptr<InProcessBus> bus = [] {
        auto made = InProcessBus::create();
        platform::messaging::setTransport(
            [made](const std::string& name, const auto&) { return made->connect(name); });
        return made;
    }();
    std::shared_ptr<platform::messaging::Subscription> observation =
        bus->observe([this](std::string_view, const JsonMessage& message) {
            published.emplace_back(message.payload());
        });

protected:
    std::unique_ptr<Serialization> service = std::make_unique<Serialization>();
};

std::string reasonOf(const std::string& answer) {
    json::Object object = json::parse(answer);
    EXPECT_EQ(object["status"], json::Value(false)) << answer;
    EXPECT_EQ(object.size(), 2u) << answer;
    return object["exception"].is<std::string>() ? object["exception"].get<std::string>() : "";
}

TEST_F(SystemCallFaults, OfATextsReadNeverGivePartOfTheText) {
    std::string text(100'000, 'x');
    test::writeFile(path, text);
    const std::string whole = R"({"data":")" + text + R"(","status":true})";
    // A file that cannot be opened reads as empty.
    const std::string unopened = R"({"data":"","status":true})";
    failEach(
        &Serialization::handleReadRequest, request("text/plain"), [] {},
        [&](const std::vector<std::string>& answers) {
            ASSERT_EQ(answers.size(), 1u);
            if (answers[0] != whole && answers[0] != unopened) {
                EXPECT_NE(reasonOf(answers[0]), "");
            }
        });
}

TEST_F(SystemCallFaults, OfAPackagesReadNeverGivePartOfThePackage) {
    handle(&Serialization::handleWriteRequest,
           request("text/xml", packageContent(std::string(100'000, 'x'))));
    const std::vector<std::string> whole =
        handle(&Serialization::handleReadRequest, request("text/xml"));
    failEach(
        &Serialization::handleReadRequest, request("text/xml"), [] {},
        [&](const std::vector<std::string>& answers) {
            if (answers != whole) {
                ASSERT_EQ(answers.size(), 1u);
                EXPECT_NE(reasonOf(answers[0]), "");
            }
        });
}

TEST_F(SystemCallFaults, OfATextsWriteAnswerFalseOnlyWhereTheOldTextIsWhole) {
    const std::string text(100'000, 'n');
    failEach(
        &Serialization::handleWriteRequest, request("text/plain", text),
        [&] { test::writeFile(path, "old"); },
        [&](const std::vector<std::string>& answers) {
            if (answers.size() == 1) {
                // The file system could not tell whether the file exists.
                EXPECT_THAT(answers[0], testing::StartsWith("thrown: "));
                EXPECT_EQ(readFile(path), "old");
                return;
            }
            EXPECT_THAT(answers, ElementsAre(notification, AnyOf("true", "false")));
            const std::string stored = readFile(path);
            if (answers[1] == "false") {
                EXPECT_EQ(stored, "old");
            } else {
                // Also after an error of the writing itself.
                EXPECT_EQ(stored, text.substr(0, stored.size()));
            }
            EXPECT_THAT(names(), ElementsAre("document"));
        });
}

TEST_F(SystemCallFaults, OfAPackagesWriteLeaveTheOldPackageOrTheNewOne) {
    const auto write = [&](const std::string& text) {
        handle(&Serialization::handleWriteRequest, request("text/xml", packageContent(text)));
        return readFile(path);
    };
    const std::string oldPackage = write("old");
    const std::string newPackage = write("new");
    failEach(
        &Serialization::handleWriteRequest, request("text/xml", packageContent("new")),
        [&] { test::writeFile(path, oldPackage); },
        [&](const std::vector<std::string>& answers) {
            const std::string stored = readFile(path);
            EXPECT_THAT(names(), ElementsAre("document"));
            if (answers.size() == 1) {
                EXPECT_THAT(answers[0], testing::StartsWith("thrown: "));
                EXPECT_EQ(stored, oldPackage);
                return;
            }
            EXPECT_THAT(answers, ElementsAre(notification, AnyOf("true", "false")));
            // After a failure of the folder's sync the new package is there already.
            EXPECT_THAT(stored, answers[1] == "true" ? testing::Matcher<std::string>(newPackage)
                                                     : AnyOf(oldPackage, newPackage));
        });
}

}  // namespace
}  // namespace EditorServices
