// SPDX-License-Identifier: Apache-2.0
// The real bundle with its delivery threads confined to a folder, by itself and behind the guard of
// its saves: it works inside as ever, and whatever a request tries, files outside stay shut.
#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "host/bus/bundle_host.h"
#include "host/guard/guard.h"
#include "host/limits/confinement.h"
#include "json/parser.h"
#include "platform/posix/file_descriptor.h"
#include "tests/host/limits/two_folders.h"
#include "tests/platform/i18n/detection/corpus.h"
#include "tests/support/running_bundle.h"
#include "tests/support/source_root.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using host::Confinement;
using platform::FileDescriptor;
using platform::messaging::JsonMessage;
using test::Message;
using test::readFile;
using test::RunningBundle;
using test::writeFile;
using testing::AnyOf;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* textType = "text/plain";
constexpr const char* packageType = "text/xml";

// The bundle behind a guard, which may guard nothing.
class Bundle {
public:
    explicit Bundle(host::Guard guard)
        : host_(
              SERIALIZATION_BUNDLE, std::size_t{1} << 28,
              [this](const JsonMessage& message) {
                  const std::lock_guard lock(mutex_);
                  published_.push_back(
                      {std::string(message.channel()), std::string(message.payload())});
              },
              std::move(guard)) {}

    // All that is published for a message.
    std::vector<Message> send(const std::string& channel, std::string_view payload) {
        host_.publish(channel, platform::DataBuffer::copyOf(payload));
        host_.waitUntilIdle();
        const std::lock_guard lock(mutex_);
        return std::exchange(published_, {});
    }

    std::vector<Message> read(const std::string& path, const std::string& contentType) {
        return send(test::readRequestChannel, RunningBundle::request(path, contentType, "1"));
    }

private:
    std::mutex mutex_;
    std::vector<Message> published_;  // guarded by mutex_
    host::BundleHost host_;
};

// Starts the bundle on a confined thread, in a process that has only loaded its library.
std::unique_ptr<Bundle> startConfined(const Confinement& confinement, const host::Guard& guard) {
    if (::dlopen(SERIALIZATION_BUNDLE, RTLD_NOW | RTLD_LOCAL) == nullptr) {
        throw std::runtime_error(::dlerror());
    }
    std::unique_ptr<Bundle> bundle;
    std::thread([&] {
        confinement.confineThisThread();
        bundle = std::make_unique<Bundle>(guard);
    }).join();
    return bundle;
}

std::string writeRequest(const fs::path& path, const char* contentType, json::Value content,
                         const std::string& encoding = "UTF-8") {
    json::Object request;
    request["rtcId"] = "1";
    request["contentType"] = contentType;
    request["filePath"] = path.string();
    request["content"] = std::move(content);
    request["encoding"] = encoding;
    return json::serialize(std::move(request));
}

json::Value minimalPackage() {
    return json::parse(R"({"parts": [], "relationships": []})");
}

// Each folder with a text and a package. The parameter says whether saves are guarded.
class ConfinedBundle : public test::TwoFolders, public testing::WithParamInterface<bool> {
protected:
    void SetUp() override {
        TwoFolders::SetUp();
        if (IsSkipped()) {
            return;
        }
        for (const fs::path& folder : {inside, outside}) {
            writeFile(folder / "text", folder.filename().string());
            fs::copy_file(test::sourceRoot() + "/examples/report.docx", folder / "package");
        }
        host::GuardOptions options(GetParam());
        options.folder = scratch / "state";
        guard = host::makeGuard(options, {inside});
        // CppMicroServices reads the bundle's file once more when it starts it.
        bundle = startConfined(
            FRAMEWORK_READS_BUNDLE
                ? Confinement({.readWrite = {inside}, .readOnly = {SERIALIZATION_BUNDLE}})
                : readWrite(),
            guard);
    }

    std::string read(const fs::path& path, const char* contentType) {
        const std::vector<Message> answers = bundle->read(path.string(), contentType);
        return answers.size() == 1 ? answers[0].payload : "no answer";
    }

    // What is published for a write request: the notification and the answer.
    std::vector<std::string> write(const fs::path& path, const char* contentType,
                                   json::Value content, const std::string& encoding = "UTF-8") {
        std::vector<std::string> payloads;
        for (Message& message :
             bundle->send(test::writeRequestChannel,
                          writeRequest(path, contentType, std::move(content), encoding))) {
            payloads.push_back(std::move(message.payload));
        }
        return payloads;
    }

    static std::string notification(const fs::path& path, bool isExistingFile) {
        json::Object notification;
        notification["filePath"] = path.string();
        notification["isExistingFile"] = isExistingFile;
        return json::serialize(std::move(notification));
    }

    // All files outside with their contents.
    std::vector<std::pair<fs::path, std::string>> allOutside() const {
        std::vector<std::pair<fs::path, std::string>> files;
        for (const auto& entry : fs::recursive_directory_iterator(outside)) {
            files.emplace_back(entry.path(), entry.is_regular_file() ? readFile(entry) : "");
        }
        std::sort(files.begin(), files.end());
        return files;
    }

    // The ways out of the granted folder to `name` in the one beside it.
    std::vector<fs::path> waysOut(const std::string& name) {
        fs::create_symlink(outside / name, inside / (name + "-link"));
        fs::create_symlink(name + "-link", inside / (name + "-chain"));
        fs::create_directory_symlink(outside, inside / (name + "-folder-link"));
        const std::string path = outside / name;
        return {
            path,
            fs::relative(path),
            inside / "../outside" / name,
            inside / (name + "-link"),
            inside / (name + "-chain"),
            inside / (name + "-folder-link") / name,
            "/proc/self/root" + path,
            "/proc/self/cwd/" + fs::relative(path).string(),
            "/proc/" + std::to_string(::getpid()) + "/root" + path,
            "/proc/self/fd/" + std::to_string(openFolder.get()) + "/" + name,
        };
    }

    FileDescriptor openFolder{
        (fs::create_directory(outside), ::open(outside.c_str(), O_PATH | O_CLOEXEC))};
    host::Guard guard;
    std::unique_ptr<Bundle> bundle;
};

INSTANTIATE_TEST_SUITE_P(Saves, ConfinedBundle, testing::Bool(),
                         [](const auto& test) { return test.param ? "Guarded" : "Unguarded"; });

TEST_P(ConfinedBundle, ReadsAndWritesInside) {
    EXPECT_EQ(read(inside / "text", textType), R"({"data":"inside","status":true})");
    EXPECT_THAT(write(inside / "text", textType, "new"),
                ElementsAre(notification(inside / "text", true), "true"));
    EXPECT_THAT(write(inside / "folder/text", textType, "new"),
                ElementsAre(notification(inside / "folder/text", false), "true"));
    EXPECT_EQ(readFile(inside / "text"), "new");
    EXPECT_EQ(readFile(inside / "folder/text"), "new");
}

TEST_P(ConfinedBundle, SavesPackagesInsideWithTheirPermissions) {
    ASSERT_EQ(::chmod((inside / "package").c_str(), 0640), 0);
    const std::string before = read(inside / "package", packageType);
    json::Object document = json::parse(before);
    ASSERT_TRUE(document.at("status").get<bool>()) << before;

    EXPECT_THAT(write(inside / "package", packageType, document),
                ElementsAre(notification(inside / "package", true), "true"));
    EXPECT_THAT(write(inside / "folder/new", packageType, document),
                ElementsAre(notification(inside / "folder/new", false), "true"));

    EXPECT_EQ(fs::status(inside / "package").permissions(), fs::perms(0640));
    EXPECT_EQ(read(inside / "package", packageType), before);
    EXPECT_EQ(read(inside / "folder/new", packageType), before);
}

TEST_P(ConfinedBundle, SavesThroughALinkThatStaysInside) {
    fs::create_symlink("../package", inside / "folder/link");
    EXPECT_THAT(write(inside / "folder/link", packageType, minimalPackage()),
                ElementsAre(notification(inside / "folder/link", true), "true"));
    EXPECT_TRUE(fs::is_symlink(inside / "folder/link"));
    EXPECT_EQ(read(inside / "package", packageType),
              R"({"parts":[],"relationships":[],"status":true})");
}

TEST_P(ConfinedBundle, TakesTextsOutsideForOnesThatMayNotBeOpened) {
    for (const fs::path& path : waysOut("text")) {
        EXPECT_EQ(read(path, textType), R"({"data":"","status":true})") << path;
    }
}

TEST_P(ConfinedBundle, TakesPackagesOutsideForOnesThatMayNotBeOpened) {
    for (const fs::path& path : waysOut("package")) {
        const json::Object answer = json::parse(read(path, packageType));
        EXPECT_FALSE(answer.at("status").get<bool>()) << path;
        EXPECT_FALSE(answer.contains("parts")) << path;
    }
    const json::Object answer = json::parse(read(outside / "package", packageType));
    EXPECT_THAT(answer.at("exception").get<std::string>(), testing::HasSubstr("Permission denied"));
}

TEST_P(ConfinedBundle, ChangesNothingThatIsOutside) {
    const auto before = allOutside();
    for (const fs::path& path : waysOut("text")) {
        EXPECT_EQ(write(path, textType, "x").back(), "false") << path;
    }
    for (const fs::path& path : waysOut("package")) {
        EXPECT_EQ(write(path, packageType, minimalPackage()).back(), "false") << path;
    }
    EXPECT_EQ(allOutside(), before);
}

TEST_P(ConfinedBundle, CreatesNothingOutside) {
    const auto before = allOutside();
    for (const fs::path& path : waysOut("new")) {
        EXPECT_EQ(write(path, textType, "x").back(), "false") << path;
        EXPECT_EQ(write(path, packageType, minimalPackage()).back(), "false") << path;
    }
    EXPECT_EQ(allOutside(), before);
}

TEST_P(ConfinedBundle, TellsOfWritesOutsideAsOfOthersThatFail) {
    EXPECT_THAT(write(outside / "text", textType, "x"),
                ElementsAre(notification(outside / "text", true), "false"));
    EXPECT_THAT(write(outside / "new", textType, "x"),
                ElementsAre(notification(outside / "new", false), "false"));
}

TEST_P(ConfinedBundle, ReadsNoDevicesAndNothingOfProc) {
    for (const char* path : {"/dev/zero", "/proc/self/environ", "/proc/self/maps", "/proc/cpuinfo",
                             "/etc/passwd", "/proc/self/exe"}) {
        EXPECT_EQ(read(path, textType), R"({"data":"","status":true})") << path;
    }
    if (!FRAMEWORK_READS_BUNDLE) {
        EXPECT_EQ(read(SERIALIZATION_BUNDLE, textType), R"({"data":"","status":true})");
    }
    EXPECT_EQ(write("/dev/null", textType, "x").back(), "false");
    EXPECT_EQ(write("/proc/self/comm", textType, "x").back(), "false");
}

// The system lets a confined thread open a pipe of its process again.
TEST_P(ConfinedBundle, ReadsAndWritesNoPipesOfTheHost) {
    int ends[2];
    ASSERT_EQ(::pipe2(ends, O_CLOEXEC | O_NONBLOCK), 0);
    const FileDescriptor readEnd(ends[0]);
    const FileDescriptor writeEnd(ends[1]);
    ASSERT_EQ(::write(writeEnd.get(), "secret", 6), 6);
    for (const FileDescriptor* end : {&readEnd, &writeEnd}) {
        const std::string path = "/proc/self/fd/" + std::to_string(end->get());
        EXPECT_EQ(read(path, textType), R"({"data":"","status":true})");
        EXPECT_THAT(json::parse(read(path, packageType)),
                    testing::Contains(testing::Key("exception")));
        EXPECT_EQ(write(path, textType, "x").back(), "false");
        EXPECT_EQ(write(path, packageType, minimalPackage()).back(), "false");
    }
    std::array<char, 10> content{};
    EXPECT_EQ(::read(readEnd.get(), content.data(), content.size()), 6);
}

// The system lets a confined thread see nothing of another process's folders, not even that they
// are there.
TEST_P(ConfinedBundle, FindsNoWayThroughAnotherProcess) {
    const auto before = allOutside();
    const std::string root = "/proc/" + std::to_string(::getppid()) + "/root";
    for (const fs::path& path : {outside / "text", outside / "new", inside / "text"}) {
        const json::Object answer = json::parse(read(root + path.string(), textType));
        EXPECT_FALSE(answer.at("status").get<bool>()) << path;
        EXPECT_THAT(write(root + path.string(), textType, "x"), IsEmpty()) << path;
    }
    EXPECT_EQ(allOutside(), before);
    EXPECT_EQ(readFile(inside / "text"), "inside");
}

// A neighbour swaps `document` for a link that leads out, and back, while `action` runs.
void whileSwapping(const fs::path& document, const fs::path& target,
                   const std::function<void()>& action) {
    const fs::path link = document.string() + "-link";
    fs::create_symlink(target, link);
    std::atomic<bool> done = false;
    std::thread swapper([&] {
        while (!done) {
            ::renameat2(AT_FDCWD, document.c_str(), AT_FDCWD, link.c_str(), RENAME_EXCHANGE);
        }
    });
    action();
    done = true;
    swapper.join();
}

TEST_P(ConfinedBundle, NeverReadsOutsideWhileALinkIsSwapped) {
    whileSwapping(inside / "text", outside / "text", [this] {
        int read = 0;
        int denied = 0;
        while (read < 200 || denied < 200) {
            const std::string answer = this->read(inside / "text", textType);
            read += answer == R"({"data":"inside","status":true})";
            denied += answer == R"({"data":"","status":true})";
            ASSERT_EQ(answer.find("outside"), std::string::npos) << answer;
        }
    });
}

TEST_P(ConfinedBundle, NeverWritesOutsideWhileAFolderIsSwapped) {
    const auto before = allOutside();
    whileSwapping(inside / "folder", outside, [this] {
        int written = 0;
        int denied = 0;
        for (int i = 0; written < 100 || denied < 100; ++i) {
            const bool isText = i % 2 == 0;
            const std::string answer =
                isText ? write(inside / "folder/text", textType, "x").back()
                       : write(inside / "folder/package", packageType, minimalPackage()).back();
            written += answer == "true";
            denied += answer == "false";
            ASSERT_THAT(answer, AnyOf("true", "false"));
        }
    });
    EXPECT_EQ(allOutside(), before);
}

// Nothing that the bundle needs for its work is left to be opened once it is loaded.
TEST_P(ConfinedBundle, HandlesEveryCharsetAsItDoesUnconfined) {
    std::vector<std::string> requests;
    std::vector<fs::path> written;
    // The sanitizers make it slow, and find in some what they would in all.
    constexpr std::size_t step = UNDER_SANITIZERS ? 10 : 1;
    const auto& corpus = test::corpusEntries();
    for (std::size_t i = 0; i < corpus.size(); i += step) {
        const auto& entry = corpus[i];
        const auto bytes = test::iconvEncode(entry.iconvName, test::corpusText(entry.language));
        if (!bytes) {
            continue;
        }
        const fs::path path = inside / std::to_string(written.size());
        writeFile(path, *bytes);
        requests.push_back(RunningBundle::request(path, textType, "1"));
        written.push_back(path.string() + ".written");
        requests.push_back(writeRequest(written.back(), textType, *bytes, entry.charset));
    }
    ASSERT_GE(written.size(), 100u / step);
    const auto handleAll = [&] {
        std::vector<std::string> results;
        for (const std::string& request : requests) {
            const bool isWrite = request.find("\"content\"") != std::string::npos;
            const auto answers = bundle->send(
                isWrite ? test::writeRequestChannel : test::readRequestChannel, request);
            results.push_back(answers.empty() ? "no answer" : answers.back().payload);
        }
        for (const fs::path& path : written) {
            results.push_back(readFile(path));
            fs::remove(path);
        }
        return results;
    };
    const std::vector<std::string> confined = handleAll();
    bundle.reset();
    bundle = std::make_unique<Bundle>(guard);
    EXPECT_EQ(handleAll(), confined);
}

TEST_P(ConfinedBundle, HandlesEveryPackageAsItDoesUnconfined) {
    std::vector<fs::path> packages;
    for (const auto& entry : fs::directory_iterator(test::sourceRoot() + "/examples")) {
        if (entry.path().extension().string().ends_with('x')) {  // .docx and its like
            packages.push_back(inside / entry.path().filename());
            fs::copy_file(entry.path(), packages.back());
        }
    }
    ASSERT_GE(packages.size(), 4u);
    const auto handleAll = [&] {
        std::vector<std::string> results;
        for (const fs::path& path : packages) {
            results.push_back(read(path, packageType));
            const fs::path copy = path.string() + ".written";
            EXPECT_EQ(write(copy, packageType, json::parse(results.back())).back(), "true");
            results.push_back(readFile(copy));
            fs::remove(copy);
        }
        return results;
    };
    const std::vector<std::string> confined = handleAll();
    bundle.reset();
    bundle = std::make_unique<Bundle>(guard);
    EXPECT_TRUE(handleAll() == confined);
}

}  // namespace
