// SPDX-License-Identifier: Apache-2.0
// How often documents are held in memory while the loaded bundle answers requests: the allocations
// that are as large as documents are counted, and the most bytes that were in use at one time.
//
// The figures are those that were reached. One that is exceeded means a new copy of the document on
// the way; one that is undercut is to be lowered here.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>

#include "framework/bundle_runner.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/data_buffer.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "tests/support/bundle_on_bus.h"
#include "tests/support/counting_malloc.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::DataBuffer;
using platform::messaging::JsonMessage;
using test::Allocations;
using testing::SizeIs;

constexpr std::size_t megabyte = 1'000'000;

constexpr const char* tooLarge = R"({"exception":"The document is too large: )";

/// `size` bytes of the lines of an XML text.
std::string xmlText(std::size_t size) {
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<text>\n";
    for (std::size_t i = 0; text.size() < size; ++i) {
        text += "<p n=\"" + std::to_string(i) + "\">It rained on " + std::to_string(i * i % 365) +
                " days of the year.</p>\n";
    }
    return text.append("</text>");
}

/// `size` bytes that cannot be deflated.
std::string noise(std::size_t size) {
    std::string bytes(size, '\0');
    std::uint64_t state = 88172645463325252U;
    for (char& byte : bytes) {
        state ^= state << 13U;
        state ^= state >> 7U;
        state ^= state << 17U;
        byte = static_cast<char>(state >> 32U);
    }
    return bytes;
}

/// A client of a bus that takes payloads up to a length, and notes for how much memory is asked.
class LimitedClient final : public platform::messaging::MessageService {
public:
    LimitedClient(std::shared_ptr<MessageService> client, const std::size_t& maxPayload,
                  std::size_t& awaited)
        : client_(std::move(client)), maxPayload_(maxPayload), awaited_(awaited) {}

    futures::Future<std::shared_ptr<platform::messaging::Subscription>> subscribe(
        const std::string& channel, platform::messaging::MessageHandler handler) override {
        return client_->subscribe(channel, std::move(handler));
    }
    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return client_->publish(channel, std::move(payload));
    }
    std::size_t maxPayload(const std::string&) const override { return maxPayload_; }
    void awaitMemory(std::size_t bytes) override { awaited_ = bytes; }

private:
    const std::shared_ptr<MessageService> client_;
    const std::size_t& maxPayload_;
    std::size_t& awaited_;
};

class DocumentCopies : public testing::Test {
protected:
    DocumentCopies() {
        // What is made once and stays is none of a document's copies.
        read("text/plain", writeTextFile("\x82\xA0\x82\xA2 Shift_JIS"));
        write(textRequest("x", "Shift_JIS"));
    }

    std::string writeTextFile(std::string_view bytes) {
        test::writeFile(folder / "text.txt", bytes);
        return (folder / "text.txt").string();
    }

    /// What a read of the file at `path` allocates, up to the end of its answer.
    Allocations read(const char* contentType, const std::string& path) {
        DataBuffer request = DataBuffer::copyOf(json::serialize(json::Value(
            json::Object{{"rtcId", "1"}, {"contentType", contentType}, {"filePath", path}})));
        awaited = 0;
        test::beginAccount();
        bundle.send(platform::messaging::readRequestChannel, std::move(request));
        bundle.bus().waitUntilIdle();
        return test::endAccount();
    }

    /// What a write of the document in `request` allocates, the request itself among it.
    Allocations write(const std::string& request) {
        test::beginAccount();
        bundle.sendAndWait(platform::messaging::writeRequestChannel, request);
        return test::endAccount();
    }

    std::string textRequest(std::string text, const char* charset) const {
        return json::serialize(
            json::Value(json::Object{{"rtcId", "1"},
                                     {"contentType", "text/plain"},
                                     {"filePath", (folder / "text.txt").string()},
                                     {"encoding", charset},
                                     {"content", std::move(text)}}));
    }

    /// A package of a text of 8 MB and four images of 3 MB.
    std::string packageRequest() const {
        const std::string image = noise(3 * megabyte);
        json::Array parts{json::Object{{"partUri", "/text.xml"},
                                       {"contentType", "application/xml"},
                                       {"content", xmlText(8 * megabyte)},
                                       {"relationship", json::Null()}}};
        for (int i = 0; i < 4; ++i) {
            parts.push_back(json::Object{{"partUri", "/image" + std::to_string(i) + ".png"},
                                         {"contentType", "image/png"},
                                         // No data URI, so that it need not be base64.
                                         {"content", image},
                                         {"relationship", json::Null()}});
        }
        return json::serialize(
            json::Value(json::Object{{"rtcId", "1"},
                                     {"contentType", "text/xml"},
                                     {"filePath", packagePath()},
                                     {"content", json::Object{{"parts", std::move(parts)},
                                                              {"relationships", json::Array()}}}}));
    }

    void writePackage(json::Array parts, json::Array relationships) {
        write(json::serialize(json::Value(
            json::Object{{"rtcId", "1"},
                         {"contentType", "text/xml"},
                         {"filePath", packagePath()},
                         {"content", json::Object{{"parts", std::move(parts)},
                                                  {"relationships", std::move(relationships)}}}})));
        ASSERT_EQ(answer, "true");
    }

    void writePackage(const char* contentType, std::string content) {
        writePackage({json::Object{{"partUri", "/part"},
                                   {"contentType", contentType},
                                   {"content", std::move(content)},
                                   {"relationship", json::Null()}}},
                     {});
    }

    std::string packagePath() const { return (folder / "package.docx").string(); }

    double timesTheAnswer(const Allocations& allocations) const {
        return static_cast<double>(allocations.peak) / static_cast<double>(answerSize);
    }

    test::TemporaryDirectory folder;
    std::size_t maxPayload = std::numeric_limits<std::size_t>::max();
    std::size_t awaited = 0;
    std::mutex mutex;
    std::string answer;
    std::size_t answerSize = 0;
    test::BundleOnBus<framework::BundleRunner> bundle{
        [this](const JsonMessage& message) {
            const std::lock_guard lock(mutex);
            answer = message.payload().substr(0, 100);
            answerSize = message.payload().size();
        },
        {.wrapClient =
             [this](std::shared_ptr<platform::messaging::MessageService> client) {
                 return std::make_shared<LimitedClient>(std::move(client), maxPayload, awaited);
             }},
        SERIALIZATION_BUNDLE};
};

// The file's bytes, and the message.
TEST_F(DocumentCopies, OfAUtf8TextThatIsRead) {
    const std::string path = writeTextFile(xmlText(8 * megabyte));
    const Allocations allocations = read("text/plain", path);
    ASSERT_GT(answerSize, 8 * megabyte);
    EXPECT_THAT(allocations.large, SizeIs(2));
    EXPECT_LE(timesTheAnswer(allocations), 2.03);
}

// The same; the sample for detecting the charset is small.
TEST_F(DocumentCopies, OfATextInALegacyCharsetThatIsRead) {
    std::string text;
    while (text.size() < 8 * megabyte) {
        text +=
            "\x82\xB1\x82\xEA\x82\xCD\x93\xFA\x96\x7B\x8C\xEA\x82\xCC\x95\xB6\x8F\xCD\x81\x42 "
            "text\n";
    }
    const Allocations allocations = read("text/plain", writeTextFile(text));
    ASSERT_GT(answerSize, 8 * megabyte);
    EXPECT_THAT(allocations.large, SizeIs(2));
    EXPECT_LE(timesTheAnswer(allocations), 2.03);
}

// The request and the text in it.
TEST_F(DocumentCopies, OfATextThatIsWritten) {
    for (const char* charset : {"UTF-8", "Shift_JIS"}) {
        const std::string request = textRequest(xmlText(8 * megabyte), charset);
        const Allocations allocations = write(request);
        EXPECT_EQ(answer, "true");
        EXPECT_THAT(allocations.large, SizeIs(2)) << charset;
        EXPECT_LE(static_cast<double>(allocations.peak) / static_cast<double>(request.size()), 1.97)
            << charset;
    }
}

// Of each part its bytes, of the request each text and the whole; and room for what is deflated.
TEST_F(DocumentCopies, OfAPackageThatIsWritten) {
    const std::string request = packageRequest();
    const Allocations allocations = write(request);
    EXPECT_EQ(answer, "true");
    EXPECT_THAT(allocations.large, SizeIs(1 + 5 + 5 + 1));
    EXPECT_LE(static_cast<double>(allocations.peak) / static_cast<double>(request.size()), 2.25);
}

// The request, its text, and the bytes that the text is decoded to; the answer's text and the
// message.
TEST_F(DocumentCopies, OfAPackageOfOneImage) {
    const std::string content = "data:image/png;base64," + std::string(16 * megabyte, 'A');
    const std::string request = json::serialize(json::Value(json::Object{
        {"rtcId", "1"},
        {"contentType", "text/xml"},
        {"filePath", packagePath()},
        {"content",
         json::Object{{"parts", json::Array{json::Object{{"partUri", "/image.png"},
                                                         {"contentType", "image/png"},
                                                         {"content", content},
                                                         {"relationship", json::Null()}}}},
                      {"relationships", json::Array()}}}}));
    const Allocations allocations = write(request);
    EXPECT_EQ(answer, "true");
    EXPECT_LE(static_cast<double>(allocations.peak) / static_cast<double>(request.size()), 2.8);
    EXPECT_LE(timesTheAnswer(read("text/xml", packagePath())), 2.05);
}

// Of each part its bytes and its content; and the message.
TEST_F(DocumentCopies, OfAPackageThatIsRead) {
    write(packageRequest());
    ASSERT_EQ(answer, "true");
    const Allocations allocations = read("text/xml", packagePath());
    ASSERT_GT(answerSize, 24 * megabyte);
    EXPECT_THAT(allocations.large, SizeIs(2 + 4 * 2 + 1));
    EXPECT_LE(timesTheAnswer(allocations), 2.03);
}

// The part's content, and as much of the answer's text, six bytes for one, as could be sent.
TEST_F(DocumentCopies, OfAPackageWhoseAnswerIsTooLongToBeSent) {
    constexpr std::size_t size = 60 * megabyte;
    writePackage("x/y", std::string(size, '\0'));
    maxPayload = 64 * megabyte;
    const Allocations allocations = read("text/xml", packagePath());
    EXPECT_THAT(answer, testing::StartsWith(tooLarge));
    EXPECT_LE(allocations.peak, size + maxPayload + megabyte);
    EXPECT_LE(allocations.peak, awaited);
}

// None at all, when what is in them is longer than can be sent.
TEST_F(DocumentCopies, OfDocumentsThatAreLongerThanCanBeSent) {
    maxPayload = 10 * megabyte;
    writePackage("x/y", std::string(11 * megabyte, 'x'));
    EXPECT_LE(read("text/xml", packagePath()).peak, megabyte / 2);
    EXPECT_THAT(answer, testing::StartsWith(tooLarge));

    const std::string path = writeTextFile(std::string(maxPayload + 1, 'x'));
    EXPECT_LE(read("text/plain", path).peak, megabyte / 2);
    EXPECT_THAT(answer, testing::StartsWith(tooLarge));
    writeTextFile(std::string(maxPayload - megabyte, 'x'));
    read("text/plain", path);
    EXPECT_THAT(answer, testing::StartsWith(R"({"data":"xxx)"));
}

// Neither of a path that no file can have.
TEST_F(DocumentCopies, OfAPathThatIsTooLong) {
    const std::string path(4 * megabyte, '/');
    for (const char* contentType : {"text/plain", "text/xml"}) {
        const Allocations allocations = read(contentType, path);
        EXPECT_THAT(answer, testing::HasSubstr("File name too long"));
        EXPECT_LE(static_cast<double>(allocations.peak) / static_cast<double>(path.size()), 4.5);
    }
    EXPECT_LE(static_cast<double>(
                  write(json::serialize(json::Value(json::Object{{"rtcId", "1"},
                                                                 {"contentType", "text/plain"},
                                                                 {"filePath", path},
                                                                 {"encoding", "UTF-8"},
                                                                 {"content", ""}})))
                      .peak) /
                  static_cast<double>(path.size()),
              5.5);
}

class MemoryForTexts : public DocumentCopies, public testing::WithParamInterface<std::string> {};

TEST_P(MemoryForTexts, IsAwaited) {
    std::string text;
    while (text.size() < 3 * megabyte) {
        text += GetParam();
    }
    const Allocations allocations = read("text/plain", writeTextFile(text));
    EXPECT_THAT(answer, testing::StartsWith(R"({"data":)"));
    EXPECT_LE(allocations.peak, awaited);
    // Beyond that, requests would wait for nothing.
    EXPECT_LE(awaited, 16 * text.size());
}

INSTANTIATE_TEST_SUITE_P(
    DocumentCopies, MemoryForTexts,
    testing::Values("plain text\n", "\x01", "Caf\xE9 cr\xE8me, \xE0 la carte et tout de suite. ",
                    "\x1B$B%F%9%H\x1B(B text\n", "~{::Wb~} text\n", std::string("t\0", 2),
                    std::string("\0\0\x4E\x2D\0\0\0\n", 8), "\xFF\xFE\x01\xE0\x80\x9F"));

class MemoryForPackages : public DocumentCopies {
protected:
    void expectAwaited() {
        const Allocations allocations = read("text/xml", packagePath());
        EXPECT_THAT(answer, testing::StartsWith(R"({"parts":)"));
        EXPECT_LE(allocations.peak, awaited);
    }

    static json::Object relationship(const std::string& id, const std::string& type) {
        return {{"relationshipId", id},
                {"relationshipType", type},
                {"target", "x"},
                {"targetMode", "External"}};
    }
};

TEST_F(MemoryForPackages, IsAwaitedForImages) {
    writePackage("image/png", noise(5 * megabyte));
    expectAwaited();
}

TEST_F(MemoryForPackages, IsAwaitedForBytesThatAreEscaped) {
    writePackage("x/y", std::string(5 * megabyte, '\0'));
    expectAwaited();
    EXPECT_LE(awaited, 18 * 5 * megabyte);
}

TEST_F(MemoryForPackages, IsAwaitedForBytesOfWhichTheLastAreEscaped) {
    writePackage("x/y", std::string(4 * megabyte, 'x') + std::string(megabyte, '\0'));
    expectAwaited();
}

TEST_F(MemoryForPackages, IsAwaitedForManyParts) {
    json::Array parts;
    for (int i = 0; i < 20'000; ++i) {
        parts.push_back(json::Object{{"partUri", "/a part with a usual name " + std::to_string(i)},
                                     {"contentType", "application/xml"},
                                     {"content", "x"},
                                     {"relationship", json::Array{relationship("a", "t")}}});
    }
    writePackage(std::move(parts), {});
    expectAwaited();
}

TEST_F(MemoryForPackages, IsAwaitedForManyRelationships) {
    for (const char* type : {"t", "http://schemas.example.org/relationships/hyperlink"}) {
        json::Array relationships;
        for (int i = 0; i < 50'000; ++i) {
            relationships.push_back(relationship("r" + std::to_string(i), type));
        }
        writePackage({}, std::move(relationships));
        expectAwaited();
    }
}

}  // namespace
