// SPDX-License-Identifier: Apache-2.0
// What is left of a text, and what is answered, when a guarded save fails at any of its system
// calls, is killed there, or finds the disk full.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "framework/bundle_runner.h"
#include "host/guard/guarded_client.h"
#include "host/guard/saves.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "platform/messaging/transport.h"
#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using platform::DataBuffer;
using platform::messaging::JsonMessage;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::Subscription;
using test::readFile;
using test::writeFile;

// Hands messages over without threads, so that what the calling thread does is the whole of a save.
class DirectService final : public MessageService {
public:
    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        if (channel == platform::messaging::writeRequestChannel) {
            write = std::move(handler);
        }
        futures::Promise<std::shared_ptr<Subscription>> promise;
        promise.setValue(std::make_shared<Subscription>());
        return promise.getFuture();
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        if (channel.starts_with(platform::messaging::writeResponsePrefix)) {
            answer = payload.view();
        }
        futures::Promise<void> promise;
        promise.setValue();
        return promise.getFuture();
    }

    MessageHandler write;
    std::string answer;
};

class GuardedSaveFaults : public testing::Test {
protected:
    void SetUp() override {
        if (!test::canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
        platform::messaging::setTransport(
            [this](const std::string&, const platform::messaging::MessageServiceOptions&) {
                futures::Promise<std::shared_ptr<MessageService>> promise;
                promise.setValue(host::savingSafely(service_, {nullptr, saves_}));
                return promise.getFuture();
            });
        bundle_ = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
        saving(at("first"))();  // what is done once in a process
        fs::remove(at("first"));
    }

    void TearDown() override { platform::messaging::setTransport({}); }

    std::string at(const std::string& name) const { return folder_ / name; }

    std::function<void()> saving(const std::string& path) {
        json::Object request{{"rtcId", "1"},
                             {"contentType", "text/plain"},
                             {"filePath", path},
                             {"content", new_},
                             {"encoding", "UTF-8"}};
        const auto payload =
            std::make_shared<const std::string>(json::serialize(json::Value(std::move(request))));
        return [this, payload] {
            service_->answer.clear();
            try {
                service_->write(JsonMessage(
                    std::make_shared<const std::string>(platform::messaging::writeRequestChannel),
                    std::string_view(*payload), payload));
            } catch (const std::exception&) {  // then there is no answer
            }
        };
    }

    // `file` as it was or as it shall be, and no other file; and answered true only when it is new.
    void expectOldOrNew(const std::string& file, const std::string& old) {
        const std::string now = readFile(at(file));
        EXPECT_TRUE(now == old || now == new_) << now.size() << " bytes: " << now.substr(0, 20);
        if (service_->answer == "true") {
            EXPECT_EQ(now, new_);
        } else {
            ++refused_;
        }
    }

    std::vector<std::string> names() const {
        std::vector<std::string> names;
        for (const auto& entry : fs::directory_iterator(folder_.path())) {
            names.push_back(entry.path().filename());
        }
        std::sort(names.begin(), names.end());
        return names;
    }

    // Makes a save fail at each of its calls, of a document that `place` puts there.
    void failEachCall(const std::function<void()>& place, const std::vector<std::string>& files) {
        place();
        const std::vector<int> calls = test::callsOf(saving(at("a.txt")));
        ASSERT_EQ(service_->answer, "true");
        for (int failing = 0; failing < static_cast<int>(calls.size()); ++failing) {
            for (const int error : {ENOSPC, EIO, EACCES, EPERM, EINTR, ENOENT}) {
                SCOPED_TRACE("call " + std::to_string(failing) + ", system call " +
                             std::to_string(calls[static_cast<std::size_t>(failing)]) + ", errno " +
                             std::to_string(error));
                place();
                test::supervise(saving(at("a.txt")), [&](int call, int index) {
                    // Without its clean-up any file may be left.
                    return index == failing && call != SYS_unlinkat ? error : 0;
                });
                expectOldOrNew("a.txt", "old");
                EXPECT_EQ(names(), files);
            }
        }
        EXPECT_GT(refused_, 20);
    }

    const test::TemporaryDirectory folder_;
    const test::TemporaryDirectory state_;
    const std::string new_ = std::string(100'000, 'n');
    const std::shared_ptr<DirectService> service_ = std::make_shared<DirectService>();
    const std::shared_ptr<host::Saves> saves_ =
        std::make_shared<host::Saves>(state_ / "locks", nullptr);
    std::unique_ptr<framework::BundleRunner> bundle_;
    int refused_ = 0;
};

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneWhicheverCallFails) {
    failEachCall([this] { writeFile(at("a.txt"), "old"); }, {"a.txt"});
}

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneOfAFileWithTwoNames) {
    failEachCall(
        [this] {
            fs::remove(at("b.txt"));
            writeFile(at("a.txt"), "old");
            fs::create_hard_link(at("a.txt"), at("b.txt"));
        },
        {"a.txt", "b.txt"});
}

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneWhenKilledAtAnyCall) {
    // How many calls there are differs by a few from one process to the next.
    int killed = 0;
    for (bool isComplete = false; !isComplete;) {
        writeFile(at("a.txt"), "old");
        const pid_t child = ::fork();
        if (child == 0) {
            test::supervise(saving(at("a.txt")), [&](int, int index) {
                return index == killed ? ::kill(::getpid(), SIGKILL) : 0;
            });
            ::_exit(service_->answer == "true" ? 0 : 1);
        }
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        isComplete = WIFEXITED(status) && WEXITSTATUS(status) == 0;
        ASSERT_TRUE(isComplete || (WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL)) << status;
        const std::string now = readFile(at("a.txt"));
        EXPECT_TRUE(now == "old" || now == new_) << "killed at " << killed;
        killed += isComplete ? 0 : 1;
    }
    EXPECT_EQ(readFile(at("a.txt")), new_);
    EXPECT_GT(killed, 20);
}

TEST_F(GuardedSaveFaults, LeaveTheOldTextOnADiskThatIsTooFullForTheNewOne) {
    int saved = 0;
    int refused = 0;
    for (int kilobytes = 0; kilobytes <= 240; kilobytes += 8) {
        const std::string disk = at("disk");
        fs::create_directory(disk);
        if (::mount("tmpfs", disk.c_str(), "tmpfs", 0, "size=256k,mode=700") != 0) {
            GTEST_SKIP() << "this user may not mount a file system";
        }
        const std::string old(8'000, 'o');
        writeFile(disk + "/a.txt", old);
        writeFile(disk + "/filler", "");
        EXPECT_EQ(::truncate((disk + "/filler").c_str(), 0), 0);
        const int filler = ::open((disk + "/filler").c_str(), O_WRONLY);
        EXPECT_EQ(::posix_fallocate(filler, 0, std::max(kilobytes, 1) * 1024), 0);
        ::close(filler);
        saving(disk + "/a.txt")();
        const std::string now = readFile(disk + "/a.txt");
        if (service_->answer == "true") {
            EXPECT_EQ(now, new_) << kilobytes;
            ++saved;
        } else {
            EXPECT_EQ(now, old) << kilobytes;
            ++refused;
        }
        EXPECT_EQ(::umount2(disk.c_str(), MNT_DETACH), 0);
    }
    EXPECT_GT(saved, 5);
    EXPECT_GT(refused, 5);
}

}  // namespace
