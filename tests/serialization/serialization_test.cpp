// SPDX-License-Identifier: Apache-2.0
#include "serialization/serialization.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <type_traits>
#include <vector>

#include "platform/i18n/codecvt.h"
#include "platform/messaging/transport.h"

namespace EditorServices {
namespace {

std::string clean(const Serialization& service, const std::string& text) {
    const auto bytes = service.cleanTextToUtf8(text);
    return {bytes.begin(), bytes.end()};
}

class SerializationTest : public testing::Test {
protected:
    Serialization service;
};

TEST_F(SerializationTest, HoldsEveryNameThatGoesOnTheWire) {
    EXPECT_EQ(service.serviceName, "EditorSerialization");
    EXPECT_EQ(service.readRequestChannel, "/zpr/service/readRequest_cpp");
    EXPECT_EQ(service.readResponsePrefix, "/zpr/service/readResponse/");
    EXPECT_EQ(service.writeRequestChannel, "/zpr/service/writeRequest_cpp");
    EXPECT_EQ(service.writeResponsePrefix, "/zpr/service/writeResponse/");
    EXPECT_EQ(service.rtcIdKey, "rtcId");
    EXPECT_EQ(service.contentTypeKey, "contentType");
    EXPECT_EQ(service.packageContentType, "text/xml");
    EXPECT_EQ(service.filePathKey, "filePath");
    EXPECT_EQ(service.contentKey, "content");
    EXPECT_EQ(service.encodingKey, "encoding");
    EXPECT_EQ(service.partsKey, "parts");
    EXPECT_EQ(service.relationshipsKey, "relationships");
    EXPECT_EQ(service.partUriKey, "partUri");
    EXPECT_EQ(service.relationshipKey, "relationship");
    EXPECT_EQ(service.relationshipTypeKey, "relationshipType");
    EXPECT_EQ(service.targetKey, "target");
    EXPECT_EQ(service.targetModeKey, "targetMode");
    EXPECT_EQ(service.relationshipIdKey, "relationshipId");
    EXPECT_EQ(service.replacementChar, char16_t{0xFFFD});
    EXPECT_EQ(service.applicationPrefix, "application/");
    EXPECT_EQ(service.dataUriPrefix, "data:");
    EXPECT_EQ(service.imagePrefix, "image/");
    EXPECT_EQ(service.zeroWidthSpace, char16_t{0x200B});
    EXPECT_EQ(service.firstNonCharacter, 65534);
    EXPECT_EQ(service.notifyFileSystemChannel, "/zpr/service/notifyFileSystemRequest");
    EXPECT_EQ(service.isExistingFileKey, "isExistingFile");
}

TEST_F(SerializationTest, DeclaresItsConstantsInTheOrderInWhichTheyAreMade) {
    const auto address = [](const auto& member) {
        return reinterpret_cast<std::uintptr_t>(std::addressof(member));
    };
    const std::vector<std::uintptr_t> addresses{
        address(service.serviceName),         address(service.readRequestChannel),
        address(service.readResponsePrefix),  address(service.writeRequestChannel),
        address(service.writeResponsePrefix), address(service.rtcIdKey),
        address(service.contentTypeKey),      address(service.packageContentType),
        address(service.filePathKey),         address(service.contentKey),
        address(service.encodingKey),         address(service.partsKey),
        address(service.relationshipsKey),    address(service.partUriKey),
        address(service.relationshipKey),     address(service.relationshipTypeKey),
        address(service.targetKey),           address(service.targetModeKey),
        address(service.relationshipIdKey),   address(service.replacementChar),
        address(service.applicationPrefix),   address(service.dataUriPrefix),
        address(service.imagePrefix),         address(service.zeroWidthSpace),
        address(service.firstNonCharacter),   address(service.notifyFileSystemChannel),
        address(service.isExistingFileKey)};
    EXPECT_TRUE(std::is_sorted(addresses.begin(), addresses.end()));
}

TEST_F(SerializationTest, ComparesCodeUnitsWithTheFirstNonCharacterAsSigned32BitIntegers) {
    static_assert(std::is_same_v<decltype(service.firstNonCharacter), const std::int32_t>);
    EXPECT_FALSE(service.isNonCharacter(0xFFFD));
    EXPECT_TRUE(service.isNonCharacter(0xFFFE));
    EXPECT_TRUE(service.isNonCharacter(0xFFFF));
}

TEST_F(SerializationTest, TellsControlsWithAndWithoutTheThreeThatTextMayHold) {
    for (unsigned unit = 0; unit <= 0xFFFF; ++unit) {
        const auto c = static_cast<char16_t>(unit);
        const bool control = unit < 0x20 || (unit >= 0x7F && unit < 0xA0);
        const bool allowed = unit == 9 || unit == 10 || unit == 13;
        ASSERT_EQ(service.isControl(c), control) << unit;
        ASSERT_EQ(service.isDisallowedControl(c), control && !allowed) << unit;
        ASSERT_EQ(service.isZeroWidthSpace(c), unit == 0x200B) << unit;
    }
}

TEST_F(SerializationTest, CleanedTextHoldsTheReplacementForEachDisallowedCodeUnit) {
    const std::string replacement = "\xEF\xBF\xBD";
    EXPECT_EQ(clean(service, std::string(1, '\0')), replacement);
    EXPECT_EQ(clean(service, "\x1F"), replacement);
    EXPECT_EQ(clean(service, "\x7F"), replacement);
    EXPECT_EQ(clean(service, "\xC2\x85"), replacement);      // U+0085
    EXPECT_EQ(clean(service, "\xC2\x9F"), replacement);      // U+009F
    EXPECT_EQ(clean(service, "\xE2\x80\x8B"), replacement);  // U+200B
    EXPECT_EQ(clean(service, "\xEF\xBF\xBE"), replacement);  // U+FFFE
    EXPECT_EQ(clean(service, "\xEF\xBF\xBF"), replacement);  // U+FFFF
}

TEST_F(SerializationTest, CleanedTextKeepsEveryOtherCodeUnit) {
    for (const std::string kept : {"\t", "\n", "\r", " ", "\xC2\xA0", "\xEF\xBF\xBD",
                                   "\xF0\x9F\x98\x80", "\xE2\x80\x8A", "\xE2\x80\x8C", ""}) {
        EXPECT_EQ(clean(service, kept), kept);
    }
}

/// The rule as it is stated: on UTF-16, code unit by code unit.
std::string cleanedByUnits(const Serialization& service, const std::u16string& text) {
    std::u16string units = text;
    for (char16_t& unit : units) {
        const bool disallowed = (unit <= 0x1F && unit != 9 && unit != 10 && unit != 13) ||
                                (unit >= 0x7F && unit <= 0x9F) || unit >= 0xFFFE || unit == 0x200B;
        unit = disallowed ? service.replacementChar : unit;
    }
    return platform::i18n::to_string(units);
}

TEST_F(SerializationTest, CleaningIsTheSameForEveryCodeUnitAmongOthers) {
    for (const std::u16string around : {u"", u"ab", u"\u20AC", u"\xD83D\xDE00"}) {
        for (unsigned unit = 0; unit <= 0xFFFF; ++unit) {
            if (unit < 0xD800 || unit > 0xDFFF) {
                const std::u16string text = around + static_cast<char16_t>(unit) + around;
                ASSERT_EQ(clean(service, platform::i18n::to_string(text)),
                          cleanedByUnits(service, text))
                    << unit;
            }
        }
    }
}

TEST_F(SerializationTest, CleaningIsTheSameAtEveryPlaceOfLongText) {
    std::mt19937 random(5);
    const std::u16string_view rare =
        u"\x1F\t\x7F\x85\u00A0\u2009\u200B\u20AC\uFFFD\uFFFE\uFFFF\uF000";
    for (int i = 0; i < 2000; ++i) {
        std::u16string text(random() % 300, u'x');
        for (std::size_t count = random() % 4; count > 0 && !text.empty(); --count) {
            text[random() % text.size()] = rare[random() % rare.size()];
        }
        ASSERT_EQ(clean(service, platform::i18n::to_string(text)), cleanedByUnits(service, text));
    }
}

TEST_F(SerializationTest, CleaningThrowsOnTextThatIsNotUtf8) {
    EXPECT_THROW(service.cleanTextToUtf8("a\xFFz"), std::runtime_error);
}

/// Notes the order in which the service object releases what it was given.
class ReleaseRecorder : public platform::messaging::MessageService {
public:
    struct Handle : platform::messaging::Subscription {
        Handle(std::string channel, std::vector<std::string>& log)
            : channel_(std::move(channel)), log_(log) {}
        ~Handle() override { log_.push_back(channel_); }
        std::string channel_;
        std::vector<std::string>& log_;
    };

    explicit ReleaseRecorder(std::vector<std::string>& log) : log_(log) {}
    ~ReleaseRecorder() override { log_.push_back("service"); }

    futures::Future<std::shared_ptr<platform::messaging::Subscription>> subscribe(
        const std::string& channel, platform::messaging::MessageHandler) override {
        futures::Promise<std::shared_ptr<platform::messaging::Subscription>> promise;
        promise.setValue(std::make_shared<Handle>(channel, log_));
        return promise.getFuture();
    }
    futures::Future<void> publish(const std::string&, platform::DataBuffer) override {
        ADD_FAILURE() << "nothing is published";
        return {};
    }

private:
    std::vector<std::string>& log_;
};

TEST(SerializationDestruction, ReleasesTheWriteThenTheReadSubscriptionThenTheService) {
    std::vector<std::string> log;
    platform::messaging::setTransport([&log](const std::string& name, const auto& options) {
        EXPECT_EQ(name, "EditorSerialization");
        EXPECT_TRUE(options.empty());
        futures::Promise<std::shared_ptr<platform::messaging::MessageService>> promise;
        promise.setValue(std::make_shared<ReleaseRecorder>(log));
        return promise.getFuture();
    });
    {
        const Serialization service;
        EXPECT_TRUE(log.empty());
    }
    platform::messaging::setTransport({});
    EXPECT_THAT(log, testing::ElementsAre("/zpr/service/writeRequest_cpp",
                                          "/zpr/service/readRequest_cpp", "service"));
}

TEST(SerializationStartUp, SurvivesAMessageServiceThatGivesNoClient) {
    bool asked = false;
    platform::messaging::setTransport([&asked](const std::string&, const auto&) {
        asked = true;
        futures::Promise<std::shared_ptr<platform::messaging::MessageService>> promise;
        promise.setValue(nullptr);
        return promise.getFuture();
    });
    { const Serialization service; }
    platform::messaging::setTransport({});
    EXPECT_TRUE(asked);
}

}  // namespace
}  // namespace EditorServices
