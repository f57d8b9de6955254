// SPDX-License-Identifier: Apache-2.0
// What is left of a document, and what is answered, when a guarded save fails at any of its system
// calls, is killed there, or finds the disk full.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "framework/bundle_runner.h"
#include "host/guard/document_version.h"
#include "host/guard/guarded_client.h"
#include "host/guard/history.h"
#include "host/guard/saves.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "platform/messaging/transport.h"
#include "tests/support/failing_malloc.h"
#include "tests/support/names_in.h"
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

// A folder with a file system of its own, while this lives.
class SmallDisk {
public:
    // `type` is one of mount(8); `source` and `options` are for it.
    SmallDisk(const std::string& folder, const std::string& type, const std::string& source,
              const std::string& options)
        : folder_(folder) {
        fs::create_directory(folder);
        const std::string command =
            "mount -t " + type + " -o " + options + " " + source + " " + folder + " 2>/dev/null";
        isMounted_ = std::system(command.c_str()) == 0;
    }
    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;
    ~SmallDisk() {
        if (isMounted_) {
            ::umount2(folder_.c_str(), MNT_DETACH);
        }
    }

    bool isMounted() const { return isMounted_; }

    // Fills the disk with a file until only `room` bytes are free.
    void leaveFree(std::uint64_t room) const {
        const std::string filler = folder_ + "/filler";
        fs::remove(filler);
        const int file = ::open(filler.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
        ::syncfs(file);  // what was written may have no blocks yet
        struct statvfs status {};
        EXPECT_EQ(::fstatvfs(file, &status), 0);
        const std::uint64_t free = status.f_bavail * status.f_frsize;
        // The filler may need blocks beside those of its content.
        std::uint64_t size = free - std::min(free, room);
        while (size != 0 && ::posix_fallocate(file, 0, static_cast<off_t>(size)) == ENOSPC) {
            size -= std::min<std::uint64_t>(size, status.f_frsize);
        }
        ::close(file);
    }

private:
    const std::string folder_;
    bool isMounted_ = false;
};

json::Object packageOf(const std::string& content) {
    return {{"parts", json::Array{json::Object{{"partUri", "/a"},
                                               {"contentType", "text/plain"},
                                               {"content", content},
                                               {"relationship", json::Null()}}}},
            {"relationships", json::Array{}}};
}

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

    // Has saves keep what they replace, in the history that is returned.
    std::shared_ptr<host::History> keepHistory() {
        const auto history = std::make_shared<host::History>(
            host::HistoryOptions{state_ / "versions", {folder_.path()}});
        bundle_.reset();
        saves_ = std::make_shared<host::Saves>(state_ / "locks", history);
        bundle_ = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
        return history;
    }

    std::string at(const std::string& name) const { return folder_ / name; }

    // A save of the new text, or with other members.
    std::function<void()> saving(const std::string& path, json::Object request = {}) {
        request.try_emplace("rtcId", "1");
        request.try_emplace("contentType", "text/plain");
        request.try_emplace("filePath", path);
        request.try_emplace("content", new_);
        request.try_emplace("encoding", "UTF-8");
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

    std::function<void()> savingPackage(const std::string& content, json::Object request = {}) {
        request["contentType"] = "text/xml";
        request["content"] = packageOf(content);
        return saving(at("a.txt"), std::move(request));
    }

    // Expects the old document or the new one, and the answer true only with the new one.
    void expectOldOrNew(const std::string& old) {
        const std::string now = readFile(at("a.txt"));
        EXPECT_TRUE(now == old || now == new_) << now.size() << " bytes: " << now.substr(0, 20);
        if (service_->answer == "true") {
            EXPECT_EQ(now, new_);
        } else {
            ++refused_;
        }
    }

    std::set<std::string> names() const { return test::namesIn(folder_.path()); }

    // Makes `save`, of a document that `place` puts there, fail at each of its calls. No other
    // files than `files` may be left.
    void failEachCall(const std::function<void()>& place, const std::function<void()>& save,
                      const std::set<std::string>& files = {"a.txt"}) {
        place();
        const std::string old = readFile(at("a.txt"));
        const std::vector<int> calls = test::callsOf(save);
        ASSERT_EQ(service_->answer, "true");
        for (int failing = 0; failing < static_cast<int>(calls.size()); ++failing) {
            for (const int error : {ENOSPC, EIO, EACCES, EPERM, EINTR, ENOENT}) {
                SCOPED_TRACE("call " + std::to_string(failing) + ", system call " +
                             std::to_string(calls[static_cast<std::size_t>(failing)]) + ", errno " +
                             std::to_string(error));
                place();
                test::supervise(save, [&](int call, int index) {
                    // Without its clean-up any file may be left.
                    return index == failing && call != SYS_unlinkat ? error : 0;
                });
                expectOldOrNew(old);
                EXPECT_EQ(names(), files);
            }
        }
        EXPECT_GT(refused_, 20);
    }

    // Makes each of the syncs of `save`, a repetition of one that was done, fail alone.
    void failEachSync(const std::function<void()>& save) {
        for (int failing = 0;; ++failing) {
            int syncs = 0;
            test::supervise(save, [&](int call, int) {
                return call == SYS_fsync && syncs++ == failing ? EIO : 0;
            });
            EXPECT_EQ(readFile(at("a.txt")), new_);
            if (failing >= syncs) {
                EXPECT_EQ(service_->answer, "true");
                EXPECT_GE(syncs, 2);  // of the document and of its folder
                return;
            }
            EXPECT_EQ(service_->answer, "false") << failing;
        }
    }

    // Saves texts on `disk` with all amounts of room left, none to enough.
    void saveAsTheDiskFills(const SmallDisk& disk, const std::string& folder) {
        const std::string old(8'000, 'o');
        for (const bool hasTwoNames : {false, true}) {
            int saved = 0;
            int refused = 0;
            for (std::uint64_t kilobytes = 0; kilobytes <= 160; kilobytes += 4) {
                fs::remove(folder + "/a.txt");
                fs::remove(folder + "/b.txt");
                fs::remove(folder + "/filler");
                writeFile(folder + "/a.txt", old);
                if (hasTwoNames) {
                    fs::create_hard_link(folder + "/a.txt", folder + "/b.txt");
                }
                disk.leaveFree(kilobytes * 1024);
                saving(folder + "/a.txt")();
                const bool isSaved = service_->answer == "true";
                EXPECT_TRUE(readFile(folder + "/a.txt") == (isSaved ? new_ : old)) << kilobytes;
                ++(isSaved ? saved : refused);
            }
            EXPECT_GT(saved, 5);
            EXPECT_GT(refused, 5);
        }
    }

    const test::TemporaryDirectory folder_;
    const test::TemporaryDirectory state_;
    std::string new_ = std::string(100'000, 'n');
    const std::shared_ptr<DirectService> service_ = std::make_shared<DirectService>();
    std::shared_ptr<host::Saves> saves_ = std::make_shared<host::Saves>(state_ / "locks", nullptr);
    std::unique_ptr<framework::BundleRunner> bundle_;
    int refused_ = 0;
};

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneWhicheverCallFails) {
    failEachCall([this] { writeFile(at("a.txt"), "old"); }, saving(at("a.txt")));
}

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneOfASaveThatNamesItsVersion) {
    failEachCall([this] { writeFile(at("a.txt"), "old"); },
                 saving(at("a.txt"), {{"baseVersion", host::digestOf("old")}}));
}

TEST_F(GuardedSaveFaults, LeaveTheOldPackageOrTheNewOneOfASaveThatNamesItsVersion) {
    savingPackage("old")();
    const std::string old = readFile(at("a.txt"));
    savingPackage("new")();
    new_ = readFile(at("a.txt"));
    failEachCall([&] { writeFile(at("a.txt"), old); },
                 savingPackage("new", {{"baseVersion", host::digestOf(old)}}));
}

TEST_F(GuardedSaveFaults, LeaveTheDocumentThatARepetitionFinds) {
    const json::Object based{{"baseVersion", host::digestOf("old")}};
    failEachCall([this] { writeFile(at("a.txt"), new_); }, saving(at("a.txt"), based));

    savingPackage("new")();
    new_ = readFile(at("a.txt"));
    failEachCall([this] { writeFile(at("a.txt"), new_); }, savingPackage("new", based));
}

// The save that is repeated may have failed at its last step.
TEST_F(GuardedSaveFaults, AnswerTrueToARepetitionOnlyWhenItIsSafeOnDisk) {
    const json::Object based{{"baseVersion", host::digestOf("old")}};
    writeFile(at("a.txt"), new_);
    failEachSync(saving(at("a.txt"), based));

    fs::create_hard_link(at("a.txt"), at("b.txt"));
    failEachSync(saving(at("a.txt"), based));

    fs::remove(at("a.txt"));
    savingPackage("new")();
    new_ = readFile(at("a.txt"));
    failEachSync(savingPackage("new", based));
}

// The new text is there then, although the answer is false.
TEST_F(GuardedSaveFaults, KeepWhatWasReplacedWhenTheFolderCannotBeSynced) {
    const auto history = keepHistory();
    for (const std::string type : {"text/plain", "text/xml"}) {
        const std::string path = at(type.substr(5));
        writeFile(path, "old");
        int syncs = 0;
        json::Object request{{"contentType", type}};
        if (type == "text/xml") {
            request["content"] = packageOf("new");
        }
        test::supervise(saving(path, std::move(request)),
                        [&](int call, int) { return call == SYS_fsync && ++syncs == 2 ? EIO : 0; });
        EXPECT_EQ(service_->answer, "false");
        EXPECT_NE(readFile(path), "old");
        const auto versions = history->versionsOf(host::History::nameOf(path));
        ASSERT_EQ(versions.size(), 1U) << type;
        EXPECT_EQ(versions[0].size, 3U);
    }
    bundle_.reset();
}

TEST_F(GuardedSaveFaults, TellTheTruthWhicheverAllocationFails) {
    const auto history = keepHistory();
    const auto save = saving(at("a.txt"));
    std::map<std::string, int> answers;
    for (long failing = 0, allocations = 1; failing < allocations; ++failing) {
        SCOPED_TRACE("allocation " + std::to_string(failing));
        writeFile(at("a.txt"), "old");
        test::failAllocation(failing, test::Failing::one);
        save();
        allocations = test::stopFailing();
        history->waitUntilIdle();
        ++answers[service_->answer];
        if (service_->answer == "true") {
            EXPECT_EQ(readFile(at("a.txt")), new_);
        } else if (service_->answer == "false") {
            EXPECT_EQ(readFile(at("a.txt")), "old");
        }
    }
    EXPECT_GT(answers["true"], 0);
    EXPECT_GT(answers["false"], 0);
    bundle_.reset();
}

TEST_F(GuardedSaveFaults, LeaveTheOldTextOrTheNewOneOfAFileWithTwoNames) {
    failEachCall(
        [this] {
            fs::remove(at("b.txt"));
            writeFile(at("a.txt"), "old");
            fs::create_hard_link(at("a.txt"), at("b.txt"));
        },
        saving(at("a.txt")), {"a.txt", "b.txt"});
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
    const SmallDisk disk(at("disk"), "tmpfs", "tmpfs", "size=512k,mode=700");
    if (!disk.isMounted()) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    saveAsTheDiskFills(disk, at("disk"));
}

// Where room is found only as the blocks of a file are.
TEST_F(GuardedSaveFaults, LeaveTheOldTextOnAFullDiskWithBlocks) {
    writeFile(at("image"), "");
    fs::resize_file(at("image"), 4 << 20);
    const std::string makeFileSystem =
        "mkfs.ext4 -q -m 0 -O ^has_journal " + at("image") + " 2>/dev/null";
    if (std::system(makeFileSystem.c_str()) != 0) {
        GTEST_SKIP() << "this system cannot make a file system of ext4";
    }
    const SmallDisk disk(at("disk"), "ext4", at("image"), "loop");
    if (!disk.isMounted()) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    saveAsTheDiskFills(disk, at("disk"));
}

}  // namespace
