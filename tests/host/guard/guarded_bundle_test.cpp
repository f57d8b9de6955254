// SPDX-License-Identifier: Apache-2.0
// The real bundle behind the guard: what a write request leaves on disk, and what is answered.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>
#include <algorithm>
#include <array>

#include <chrono>
#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "host/bus/bundle_host.h"
#include "host/guard/document_version.h"
#include "host/guard/guard.h"
#include "host/guard/history.h"
#include "host/guard/saves.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/posix/file_descriptor.h"
#include "tests/support/lease_holder.h"
#include "tests/support/names_in.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using platform::FileDescriptor;
using platform::messaging::JsonMessage;
using test::readFile;
using test::writeFile;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

class GuardedBundle : public testing::Test {
protected:
    void SetUp() override { start(history_); }

    // Whatever is published is preceded by a call of `atPublication`.
    void start(
        const std::shared_ptr<host::History>& history,
        std::function<void()> atPublication = [] {}) {
        host_ = std::make_unique<host::BundleHost>(
            SERIALIZATION_BUNDLE, std::size_t{1} << 28,
            [this, atPublication = std::move(atPublication)](const JsonMessage& message) {
                atPublication();
                const std::lock_guard lock(mutex_);
                published_.emplace_back(message.payload());
            },
            host::Guard{history, std::make_shared<host::Saves>(state_ / "locks", history)});
    }

    // What is published for a request with these members beside the usual ones.
    std::vector<std::string> write(const std::string& path, json::Value content,
                                   json::Object more = {}) {
        json::Object request = std::move(more);
        request.try_emplace("rtcId", "1");
        request.try_emplace("contentType", content.is<std::string>() ? "text/plain" : "text/xml");
        request.try_emplace("encoding", "UTF-8");
        request.try_emplace("filePath", path);
        request.try_emplace("content", std::move(content));
        return send(json::serialize(json::Value(std::move(request))));
    }

    std::vector<std::string> send(const std::string& request) {
        host_->publish(platform::messaging::writeRequestChannel,
                       platform::DataBuffer::copyOf(request));
        host_->waitUntilIdle();
        const std::lock_guard lock(mutex_);
        return std::exchange(published_, {});
    }

    static std::vector<std::string> outcome(const std::string& path, bool existed, bool isSaved) {
        return {json::serialize(
                    json::Value(json::Object{{"filePath", path}, {"isExistingFile", existed}})),
                isSaved ? "true" : "false"};
    }

    // Makes a save that names the version `base`, and expects an answer with the new version.
    void expectSaved(const std::string& path, json::Value content, const std::string& base,
                     bool existed) {
        const std::vector<std::string> messages =
            write(path, std::move(content), {{"baseVersion", base}});
        std::vector<std::string> expected = outcome(path, existed, true);
        expected.insert(expected.begin() + 1,
                        R"({"status":true,"version":")" + version(path) + "\"}");
        EXPECT_EQ(messages, expected);
    }

    std::set<std::string> names() const { return test::namesIn(folder_.path()); }

    std::string at(const std::string& name) const { return folder_ / name; }

    static std::string version(const std::string& path) {
        return host::versionOf(FileDescriptor(::open(path.c_str(), O_RDONLY)).get());
    }

    const test::TemporaryDirectory folder_;
    const test::TemporaryDirectory state_;
    const std::shared_ptr<host::History> history_ = std::make_shared<host::History>(
        host::HistoryOptions{state_ / "versions", {folder_.path()}});
    std::mutex mutex_;
    std::vector<std::string> published_;  // guarded by mutex_
    std::unique_ptr<host::BundleHost> host_;
};

// The bundle saves with the rights of a user who owns none of the files.
class GuardedBundleOfAnotherUser : public GuardedBundle {
protected:
    void SetUp() override {
        if (::geteuid() != 0) {
            GTEST_SKIP() << "this user cannot become another one";
        }
        bool isOther = false;
        // Threads inherit the rights of the one that starts them. These system calls change the
        // calling thread's rights, the functions of the C library those of all threads.
        std::thread([this, &isOther] {
            isOther = ::syscall(SYS_setgroups, 0, nullptr) == 0 &&
                      ::syscall(SYS_setresgid, nobody, nobody, nobody) == 0 &&
                      ::syscall(SYS_setresuid, nobody, nobody, nobody) == 0;
            start(history_);
        }).join();
        ASSERT_TRUE(isOther);
        writeFile(at("a.txt"), "old");
        fs::permissions(at("a.txt"), fs::perms::all);
    }

    // Sets what this user may do in the folder.
    void allow(mode_t mode) { ASSERT_EQ(::chmod(folder_.path().c_str(), mode), 0); }

    static ino_t inodeOf(const std::string& path) {
        struct stat status {};
        return ::stat(path.c_str(), &status) == 0 ? status.st_ino : 0;
    }

    static constexpr uid_t nobody = 65534;
};

TEST_F(GuardedBundle, SavesANewTextAndTellsThatThereWasNone) {
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), false, true));
    EXPECT_EQ(readFile(at("a.txt")), "new");
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundle, ReplacesATextByAnotherFileThatHasAllThatTheOldOneHad) {
    writeFile(at("a.txt"), "old");
    ASSERT_EQ(::chmod(at("a.txt").c_str(), 0640), 0);
    const bool hasAttributes = ::setxattr(at("a.txt").c_str(), "user.origin", "there", 5, 0) == 0;
    const FileDescriptor old(::open(at("a.txt").c_str(), O_RDONLY));

    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_EQ(readFile(at("a.txt")), "new");
    EXPECT_EQ(readFile("/proc/self/fd/" + std::to_string(old.get())), "old");
    struct stat status {};
    ASSERT_EQ(::stat(at("a.txt").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
    if (hasAttributes) {
        EXPECT_EQ(::getxattr(at("a.txt").c_str(), "user.origin", nullptr, 0), 5);
    }
}

TEST_F(GuardedBundle, KeepsTheOldTextWhenTheNewOneIsNotValidInItsCharset) {
    writeFile(at("a.txt"), "old");
    for (const char* encoding : {"UTF-8", "no such charset"}) {
        EXPECT_EQ(write(at("a.txt"), "\xFF", {{"encoding", encoding}}),
                  outcome(at("a.txt"), true, false));
    }
    EXPECT_EQ(readFile(at("a.txt")), "old");
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundle, SavesTextsThatTheBundleStoresInOtherBytes) {
    // A shift to JIS X 0201 and back is not made again for what is ASCII in both.
    const std::string text = "\x1B(Jabc\x1B(B";
    EXPECT_EQ(write(at("a.txt"), text, {{"encoding", "ISO-2022-JP"}}).back(), "true");
    EXPECT_TRUE(readFile(at("a.txt")).ends_with("abc") || readFile(at("a.txt")) == text);
}

TEST_F(GuardedBundle, FollowsLinks) {
    writeFile(at("a.txt"), "old");
    fs::create_symlink("a.txt", at("link"));
    fs::create_symlink("none.txt", at("dangling"));
    EXPECT_EQ(write(at("link"), "new"), outcome(at("link"), true, true));
    EXPECT_EQ(write(at("dangling"), "new"), outcome(at("dangling"), false, true));
    EXPECT_TRUE(fs::is_symlink(at("link")));
    EXPECT_EQ(readFile(at("a.txt")), "new");
    EXPECT_EQ(readFile(at("none.txt")), "new");
}

TEST_F(GuardedBundle, WritesInPlaceWhereAFileHasOtherNames) {
    writeFile(at("a.txt"), "old");
    fs::create_hard_link(at("a.txt"), at("b.txt"));
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_EQ(readFile(at("b.txt")), "new");
    EXPECT_THAT(names(), ElementsAre("a.txt", "b.txt"));

    EXPECT_EQ(write(at("a.txt"), "\xFF").back(), "false");
    EXPECT_EQ(readFile(at("b.txt")), "new");
    history_->waitUntilIdle();
    EXPECT_EQ(history_->versionsOf(host::History::nameOf(at("a.txt"))).size(), 1U);
}

TEST_F(GuardedBundle, KeepsTheOldTextAsAVersionBeforeItWritesInPlace) {
    writeFile(at("a.txt"), "old");
    fs::create_hard_link(at("a.txt"), at("b.txt"));
    EXPECT_EQ(write(at("a.txt"), "new").back(), "true");
    const std::string document = host::History::nameOf(at("a.txt"));
    const auto versions = history_->versionsOf(document);  // without waiting for copies
    ASSERT_EQ(versions.size(), 1U);
    const FileDescriptor kept = history_->open(document, versions[0].time);
    EXPECT_EQ(readFile("/proc/self/fd/" + std::to_string(kept.get())), "old");
}

TEST_F(GuardedBundle, WaitsForALeaseOfWhatItSaves) {
    for (const bool hasTwoNames : {false, true}) {
        for (const json::Object& more :
             {json::Object{}, json::Object{{"baseVersion", host::digestOf("old")}}}) {
            writeFile(at("a.txt"), "old");
            if (hasTwoNames) {
                fs::remove(at("b.txt"));
                fs::create_hard_link(at("a.txt"), at("b.txt"));
            }
            const test::LeaseHolder holder(at("a.txt"), std::chrono::milliseconds(100));
            if (!holder.hasLease()) {
                GTEST_SKIP() << "this file system has no leases";
            }
            const std::vector<std::string> messages = write(at("a.txt"), "new", more);
            EXPECT_EQ((std::vector{messages.front(), messages.back()}),
                      outcome(at("a.txt"), true, true));
            EXPECT_EQ(readFile(at("a.txt")), "new");
        }
    }
}

TEST_F(GuardedBundle, WritesInPlaceWhereAFileIsAMountPoint) {
    writeFile(at("a.txt"), "old");
    writeFile(at("mounted.txt"), "mounted");
    if (::mount(at("mounted.txt").c_str(), at("a.txt").c_str(), nullptr, MS_BIND, nullptr) != 0) {
        GTEST_SKIP() << "this user may not mount a file";
    }
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_EQ(readFile(at("mounted.txt")), "new");
    EXPECT_EQ(::umount2(at("a.txt").c_str(), MNT_DETACH), 0);
    EXPECT_EQ(readFile(at("a.txt")), "old");
}

TEST_F(GuardedBundleOfAnotherUser, WritesInPlaceWhereTheFolderTakesNoNewFile) {
    allow(0755);
    const ino_t before = inodeOf(at("a.txt"));
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_EQ(readFile(at("a.txt")), "new");
    EXPECT_EQ(inodeOf(at("a.txt")), before);
    EXPECT_EQ(write(at("a.txt"), "\xFF"), outcome(at("a.txt"), true, false));
    EXPECT_EQ(readFile(at("a.txt")), "new");
}

TEST_F(GuardedBundleOfAnotherUser, WritesInPlaceWhereTheOwnerCannotBeKept) {
    allow(0777);
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_EQ(readFile(at("a.txt")), "new");
    struct stat status {};
    ASSERT_EQ(::stat(at("a.txt").c_str(), &status), 0);
    EXPECT_EQ(status.st_uid, 0U);
    EXPECT_EQ(status.st_mode & 07777U, 0777U);
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundleOfAnotherUser, SavesNothingThatMayNotBeWritten) {
    allow(0777);
    ASSERT_EQ(::chmod(at("a.txt").c_str(), 0644), 0);
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, false));
    EXPECT_EQ(readFile(at("a.txt")), "old");
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundle, AnswersAsTheBundleDoesWhereThereCanBeNoDocument) {
    fs::create_directory(at("folder"));
    EXPECT_EQ(write(at("folder"), "x"), outcome(at("folder"), true, false));
    EXPECT_EQ(write(at("none/a.txt"), "x"), outcome(at("none/a.txt"), false, false));
    EXPECT_EQ(write("", "x"), outcome("", false, false));
    EXPECT_EQ(write("/dev/null", "x"), outcome("/dev/null", true, true));
    EXPECT_THAT(write("/" + std::string(5000, 'a'), "x"), IsEmpty());
    EXPECT_THAT(send(R"({"rtcId":"1"})"), IsEmpty());
    EXPECT_THAT(names(), ElementsAre("folder"));
}

// Too short to make room for that of the new file.
TEST_F(GuardedBundle, SavesUnderAShortPath) {
    const fs::path before = fs::current_path();
    fs::current_path(folder_.path());
    EXPECT_EQ(write("a", "new"), outcome("a", false, true));
    fs::current_path(before);
    EXPECT_EQ(readFile(at("a")), "new");
    EXPECT_THAT(names(), ElementsAre("a"));
}

TEST_F(GuardedBundle, SavesUnderTheLongestPathThatThereIs) {
    const std::string name(255, 'n');
    EXPECT_EQ(write(at(name), "x").back(), "true");
    std::string path = at("");
    while (path.size() + 101 < 4095) {
        path += std::string(99, 'p') + "/";
    }
    fs::create_directories(path);
    path += std::string(4095 - path.size(), 'x');
    EXPECT_EQ(write(path, "x").back(), "true");
    EXPECT_EQ(readFile(path), "x");
}

TEST_F(GuardedBundle, RefusesASaveOfAnotherVersionThanTheOneThatIsThere) {
    writeFile(at("a.txt"), "old");
    const std::string old = version(at("a.txt"));
    EXPECT_EQ(write(at("a.txt"), "one", {{"baseVersion", old}}).back(), "true");
    EXPECT_EQ(write(at("a.txt"), "two", {{"baseVersion", old}}), outcome(at("a.txt"), true, false));
    EXPECT_EQ(readFile(at("a.txt")), "one");
    EXPECT_EQ(write(at("a.txt"), "two", {{"baseVersion", version(at("a.txt"))}}).back(), "true");
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundle, TellsTheVersionThatASaveHasMade) {
    expectSaved(at("a.txt"), "one", "", false);
    fs::create_hard_link(at("a.txt"), at("b.txt"));  // so that it is written in place
    expectSaved(at("a.txt"), "two", version(at("a.txt")), true);
}

TEST_F(GuardedBundle, TakesTheEmptyVersionForNoDocument) {
    EXPECT_EQ(write(at("a.txt"), "one", {{"baseVersion", ""}}).back(), "true");
    EXPECT_EQ(write(at("a.txt"), "two", {{"baseVersion", ""}}).back(), "false");
    EXPECT_EQ(write(at("b.txt"), "two", {{"baseVersion", "0123"}}).back(), "false");
    EXPECT_THAT(names(), ElementsAre("a.txt"));
}

TEST_F(GuardedBundle, RefusesAVersionThatIsNoString) {
    EXPECT_EQ(write(at("a.txt"), "x", {{"baseVersion", 1.0}}), outcome(at("a.txt"), false, false));
    EXPECT_EQ(write(at("a.txt"), "x", {{"baseVersion", json::Null()}}).back(), "false");
    EXPECT_THAT(names(), IsEmpty());
}

TEST_F(GuardedBundle, AnswersTheRepetitionOfTheLastSaveAsThatSave) {
    writeFile(at("a.txt"), "old");
    const std::string old = version(at("a.txt"));
    for (int i = 0; i < 2; ++i) {
        expectSaved(at("a.txt"), "new", old, true);
    }
    fs::create_hard_link(at("a.txt"), at("b.txt"));
    expectSaved(at("a.txt"), "new", old, true);
    EXPECT_EQ(write(at("a.txt"), "other", {{"baseVersion", old}}).back(), "false");
    EXPECT_EQ(readFile(at("b.txt")), "new");
}

json::Value package(const std::string& content) {
    return json::Object{{"parts", json::Array{json::Object{{"partUri", "/a"},
                                                           {"contentType", "text/plain"},
                                                           {"content", content},
                                                           {"relationship", json::Null()}}}},
                        {"relationships", json::Array{}}};
}

TEST_F(GuardedBundle, HoldsPackagesToTheirVersionToo) {
    expectSaved(at("a.docx"), package("one"), "", false);
    const std::string one = version(at("a.docx"));
    for (int i = 0; i < 2; ++i) {  // the second is a repetition
        expectSaved(at("a.docx"), package("two"), one, true);
    }
    EXPECT_EQ(write(at("a.docx"), package("three"), {{"baseVersion", one}}),
              outcome(at("a.docx"), true, false));
    EXPECT_EQ(write(at("a.docx"), package("three"), {{"baseVersion", ""}}).back(), "false");
    EXPECT_THAT(names(), ElementsAre("a.docx"));
}

TEST_F(GuardedBundle, KeepsWhatSavesReplace) {
    write(at("a.txt"), "one");
    write(at("a.txt"), "two");
    write(at("a.txt"), "three");
    history_->waitUntilIdle();
    const std::string document = host::History::nameOf(at("a.txt"));
    const auto versions = history_->versionsOf(document);
    ASSERT_EQ(versions.size(), 2U);
    const FileDescriptor newest = history_->open(document, versions[0].time);
    EXPECT_EQ(readFile("/proc/self/fd/" + std::to_string(newest.get())), "two");
}

TEST_F(GuardedBundle, KeepsNoVersionForSavesThatChangeNothing) {
    writeFile(at("linked.txt"), "old");
    fs::create_hard_link(at("linked.txt"), at("other.txt"));  // so that it is written in place
    const std::pair<std::string, std::array<json::Value, 2>> documents[] = {
        {"a.txt", {"old", "new"}},
        {"linked.txt", {"old", "new"}},
        {"a.docx", {package("old"), package("new")}}};
    for (const auto& [name, contents] : documents) {
        for (const json::Value& content : contents) {
            for (int i = 0; i < 30; ++i) {
                EXPECT_EQ(write(at(name), content).back(), "true");
                expectSaved(at(name), content, version(at(name)), true);
            }
        }
        history_->waitUntilIdle();
        EXPECT_EQ(history_->versionsOf(host::History::nameOf(at(name))).size(), 1U) << name;
    }
}

TEST_F(GuardedBundle, LeavesATextAloneThatIsThereAlready) {
    for (const bool hasTwoNames : {false, true}) {
        write(at("a.txt"), "text");
        if (hasTwoNames) {
            fs::create_hard_link(at("a.txt"), at("b.txt"));
        }
        const fs::file_time_type longAgo{std::chrono::hours(1)};
        fs::last_write_time(at("a.txt"), longAgo);
        EXPECT_EQ(write(at("a.txt"), "text"), outcome(at("a.txt"), true, true));
        EXPECT_EQ(fs::last_write_time(at("a.txt")), longAgo);
    }
}

// To delete a large file takes time, for which no client should wait.
TEST_F(GuardedBundle, DeletesWhatASaveReplacedAfterItsAnswer) {
    writeFile(at("a.txt"), "old");
    const auto isStillThere = [old = at("a.txt") + " (deleted)"] {
        const fs::directory_iterator open("/proc/self/fd");
        return std::any_of(begin(open), end(open), [&](const fs::directory_entry& entry) {
            std::error_code ignored;
            return fs::read_symlink(entry, ignored) == old;
        });
    };
    std::vector<bool> wasThere;
    host_.reset();
    start(nullptr, [&] { wasThere.push_back(isStillThere()); });
    EXPECT_EQ(write(at("a.txt"), "new"), outcome(at("a.txt"), true, true));
    EXPECT_THAT(wasThere, ElementsAre(true, true));
    EXPECT_FALSE(isStillThere());
    host_.reset();
}

TEST_F(GuardedBundle, RemovesWhatKilledSavesLeftADayAgo) {
    const std::string old = at(".~saving-0123456789abcdef.tmp");
    const std::string recent = at(".~saving-0123456789abcdee.tmp");
    const std::string document = at(".~saving-notes.tmp");
    for (const std::string& path : {old, recent, document}) {
        writeFile(path, "x");
    }
    for (const std::string& path : {old, document}) {
        fs::last_write_time(path, fs::file_time_type::clock::now() - std::chrono::hours(25));
    }
    write(at("a.txt"), "x");
    EXPECT_THAT(names(),
                ElementsAre(".~saving-0123456789abcdee.tmp", ".~saving-notes.tmp", "a.txt"));
}

TEST_F(GuardedBundle, RemovesThemWhereALinkLeads) {
    fs::create_directory(at("inner"));
    const std::string old = at("inner/.~saving-0123456789abcdef.tmp");
    writeFile(old, "x");
    fs::last_write_time(old, fs::file_time_type::clock::now() - std::chrono::hours(25));
    writeFile(at("inner/a.txt"), "old");
    fs::create_symlink("inner/a.txt", at("link"));
    write(at("link"), "new");
    EXPECT_THAT(test::namesIn(at("inner")), ElementsAre("a.txt"));
}

// A large folder takes long to list, so not every save in it does.
TEST_F(GuardedBundle, LooksForWhatKilledSavesLeftNotWithEverySave) {
    write(at("a.txt"), "x");
    const std::string old = at(".~saving-0123456789abcdef.tmp");
    writeFile(old, "x");
    fs::last_write_time(old, fs::file_time_type::clock::now() - std::chrono::hours(25));
    write(at("a.txt"), "y");
    EXPECT_THAT(names(), ElementsAre(".~saving-0123456789abcdef.tmp", "a.txt"));
}

}  // namespace
