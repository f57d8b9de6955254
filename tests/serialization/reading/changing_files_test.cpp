// Documents that others change, move and delete while they are read.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <filesystem>
#include <functional>
#include <string>
#include <system_error>
#include <thread>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;

constexpr int kReads = 300;

class ChangingFiles : public testing::Test {
protected:
    /// Calls `read` again and again while another thread calls `change`.
    void readDuring(const std::function<void()>& change, const std::function<void()>& read) {
        std::atomic<bool> isDone = false;
        std::thread changing([&] {
            while (!isDone) {
                change();
            }
        });
        for (int i = 0; i < kReads && !HasFailure(); ++i) {
            read();
        }
        isDone = true;
        changing.join();
    }

    Serialization service;
    test::TemporaryDirectory folder;
    const std::filesystem::path path = folder / "document";
};

TEST_F(ChangingFiles, OfTextGiveWhatWasThereAtSomeTime) {
    test::writeFile(path, "x");
    const int file = ::open(path.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC);
    ASSERT_GE(file, 0);
    const std::string more(3000, 'x');
    std::size_t size = 1;
    readDuring(
        [&] {
            if (size < 200'000) {
                size += static_cast<std::size_t>(
                    std::max<ssize_t>(0, ::write(file, more.data(), more.size())));
            } else {
                ASSERT_EQ(::ftruncate(file, 1), 0);
                size = 1;
            }
        },
        [&] {
            const json::Object answer = service.readTextDocument(to_ustring(path.string()));
            ASSERT_EQ(answer.at("status"), json::Value(true));
            EXPECT_EQ(answer.at("data").get<std::string>().find_first_not_of('x'),
                      std::string::npos);
        });
    ::close(file);
}

TEST_F(ChangingFiles, OfTextThatComeAndGoAreThereOrMissing) {
    const std::filesystem::path elsewhere = folder / "elsewhere";
    test::writeFile(path, "text");
    readDuring(
        [&] {
            std::filesystem::rename(path, elsewhere);
            std::filesystem::rename(elsewhere, path);
        },
        [&] {
            const std::string answer =
                json::serialize(json::Value(service.readTextDocument(to_ustring(path.string()))));
            // Gone between being found and being opened, a file reads as empty.
            EXPECT_TRUE(answer == R"({"data":"text","status":true})" ||
                        answer == R"({"data":"","status":true})" ||
                        answer == R"({"exception":"File does not exist","status":false})")
                << answer;
        });
}

TEST_F(ChangingFiles, OfPackagesGiveThePackageOrTheReason) {
    const std::u16string name = to_ustring(path.string());
    const std::string text(200'000, 'x');
    ASSERT_TRUE(service.writePackageDocument(
        name, json::parse(R"({"parts":[{"partUri":"/a.txt","contentType":"text/plain",)"
                          R"("relationship":null,"content":")" +
                          text + R"("}],"relationships":[]})")));
    const std::string archive = test::readFile(path);
    const json::Object whole = service.readPackageDocument(name);
    ASSERT_EQ(whole.at("status"), json::Value(true));
    std::size_t cut = 0;
    readDuring(
        [&] {
            cut = (cut + 37) % archive.size();
            std::error_code ignored;
            std::filesystem::resize_file(path, cut, ignored);
            test::writeFile(path, archive);
        },
        [&] {
            const json::Object answer = service.readPackageDocument(name);
            if (answer != whole) {
                EXPECT_EQ(answer.at("status"), json::Value(false));
                EXPECT_FALSE(answer.at("exception").get<std::string>().empty());
            }
        });
}

}  // namespace
}  // namespace EditorServices
