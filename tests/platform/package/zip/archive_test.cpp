// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/archive.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <random>
#include <stdexcept>

#include "platform/package/zip/limits.h"
#include "tests/platform/package/package_test_support.h"

namespace test {
namespace {

using testing::HasSubstr;
using testing::ThrowsMessage;
namespace zip = platform::package::zip;

class ZipArchiveTest : public testing::Test {
protected:
    std::string write(const std::string& bytes) {
        folder_.file("a.zip", bytes);
        return (folder_.path() / "a.zip").string();
    }

    std::string readOnly(const std::string& bytes, std::size_t index = 0) {
        return readFrom(write(bytes), index);
    }

    static std::string readFrom(const std::string& path, std::size_t index = 0) {
        zip::Archive archive(path);
        const zip::Archive::Entry& entry = archive.entries().at(index);
        std::vector<std::uint8_t> out(entry.size);
        archive.read(entry, out);
        return textOf(out);
    }

    void expectRefusedAtOpening(const std::string& bytes, const std::string& message) {
        const std::string path = write(bytes);
        EXPECT_THAT([&] { zip::Archive{path}; },
                    ThrowsMessage<std::runtime_error>(HasSubstr(message)));
    }

    void expectRefusedByLimits(const std::string& bytes, const std::string& message) {
        const zip::Archive archive(write(bytes));
        EXPECT_THAT([&] { archive.requireWithinLimits(entriesOf(archive)); },
                    ThrowsMessage<std::runtime_error>(HasSubstr(message)));
    }

    static std::vector<const zip::Archive::Entry*> entriesOf(const zip::Archive& archive) {
        std::vector<const zip::Archive::Entry*> entries;
        for (const zip::Archive::Entry& entry : archive.entries()) {
            entries.push_back(&entry);
        }
        return entries;
    }

    void expectRefusedAtReading(const std::string& bytes, const std::string& message) {
        EXPECT_THAT([&] { readOnly(bytes); },
                    ThrowsMessage<std::runtime_error>(HasSubstr(message)));
    }

    TemporaryFolder folder_;
};

std::string randomText(std::size_t length) {
    std::mt19937 random(7);
    std::string text(length, '\0');
    for (char& c : text) {
        c = static_cast<char>(random() % 64 + ' ');
    }
    return text;
}

TEST_F(ZipArchiveTest, ReadsStoredAndDeflatedEntriesInOrder) {
    const std::string text = randomText(100'000);
    const std::string bytes = buildZip({{"b", text, false}, {"a", text, true}, {"c", "", true}});
    zip::Archive archive(write(bytes));
    ASSERT_EQ(archive.entries().size(), 3U);
    EXPECT_EQ(archive.entries()[0].name, "b");
    EXPECT_EQ(archive.entries()[1].name, "a");
    EXPECT_EQ(readOnly(bytes, 0), text);
    EXPECT_EQ(readOnly(bytes, 1), text);
    EXPECT_EQ(readOnly(bytes, 2), "");
}

TEST_F(ZipArchiveTest, ReadsAnEmptyDeflatedEntryWithoutData) {
    ZipEntry entry{"a", ""};
    entry.method = 8;
    EXPECT_EQ(readOnly(buildZip({entry})), "");
}

TEST_F(ZipArchiveTest, ReadsAnArchiveWithoutEntries) {
    EXPECT_TRUE(zip::Archive(write(buildZip({}))).entries().empty());
}

TEST_F(ZipArchiveTest, ReadsDataDescriptors) {
    ZipEntry entry{"a", "some text", true};
    entry.hasDataDescriptor = true;
    EXPECT_EQ(readOnly(buildZip({entry, {"b", "x"}})), "some text");
}

TEST_F(ZipArchiveTest, ReadsZip64) {
    ZipEntry entry{"a", "some text", true};
    entry.isZip64 = true;
    ZipOptions options;
    options.isZip64 = true;
    EXPECT_EQ(readOnly(buildZip({entry}, options)), "some text");
}

TEST_F(ZipArchiveTest, ReadsEntriesBeyondFourGigabytes) {
    constexpr std::uint64_t hole = std::uint64_t{5} << 30U;
    ZipEntry entry{"a", "some text", true};
    entry.isZip64 = true;
    entry.offset = hole;
    ZipOptions options;
    options.isZip64 = true;
    const std::string atTheBeginning = buildZip({entry}, options);
    options.directoryOffset = hole + atTheBeginning.find("PK\1\2");
    options.zip64EndOffset = hole + atTheBeginning.find("PK\6\6");
    const std::string path = write("");
    std::filesystem::resize_file(path, hole);
    std::ofstream(path, std::ios::binary | std::ios::app) << buildZip({entry}, options);
    EXPECT_EQ(readFrom(path), "some text");
}

TEST_F(ZipArchiveTest, FindsTheDirectoryBeforeACommentAndBytesBehindIt) {
    ZipOptions options;
    options.comment = "a comment with PK\5\6 in it, and again PK\5\6" + std::string(40, '\xFF');
    EXPECT_EQ(readOnly(buildZip({{"a", "x"}}, options)), "x");
    options.comment = std::string(0xFFFF, 'c');
    EXPECT_EQ(readOnly(buildZip({{"a", "x"}}, options)), "x");
    options.comment.clear();
    options.suffix = "left behind";
    EXPECT_EQ(readOnly(buildZip({{"a", "x"}}, options)), "x");
}

TEST_F(ZipArchiveTest, ReadsNamesInUtf8WhetherFlaggedOrNot) {
    ZipEntry flagged{"m\xC3\xA9", "x"};
    flagged.flags = 1 << 11;
    EXPECT_EQ(zip::Archive(write(buildZip({flagged}))).entries()[0].name, "m\xC3\xA9");
    EXPECT_EQ(zip::Archive(write(buildZip({{"m\xC3\xA9", "x"}}))).entries()[0].name, "m\xC3\xA9");
}

TEST_F(ZipArchiveTest, ReadsOtherNamesAsCodePage437) {
    EXPECT_EQ(zip::Archive(write(buildZip({{"m\x82\xE1", "x"}}))).entries()[0].name,
              "m\xC3\xA9\xC3\x9F");
}

TEST_F(ZipArchiveTest, PrefersTheUnicodeNameMadeForTheOtherName) {
    ZipEntry entry{"m\x82", "x"};
    const std::string unicode = "\xD0\xBC";
    entry.extra = bytes16(0x1234) + bytes16(1) + "?" + bytes16(0x7075) + bytes16(7) + "\1" +
                  bytes32(checksum(entry.name)) + unicode;
    EXPECT_EQ(zip::Archive(write(buildZip({entry}))).entries()[0].name, unicode);
    entry.name = "n\x82";  // the extra field is no longer about this name
    EXPECT_EQ(zip::Archive(write(buildZip({entry}))).entries()[0].name, "n\xC3\xA9");
}

TEST_F(ZipArchiveTest, RefusesANameThatIsNotTheUtf8ItClaims) {
    ZipEntry entry{"m\x82", "x"};
    entry.flags = 1 << 11;
    expectRefusedAtOpening(buildZip({entry}),
                           "entry \"m\xEF\xBF\xBD\" has a name that is not valid UTF-8");
}

TEST_F(ZipArchiveTest, ToleratesABrokenExtraField) {
    ZipEntry entry{"a", "x"};
    entry.extra = bytes16(0x7075) + bytes16(500) + "\1";
    EXPECT_EQ(readOnly(buildZip({entry})), "x");
}

TEST_F(ZipArchiveTest, RefusesWhatIsNoArchive) {
    expectRefusedAtOpening("", "is empty");
    expectRefusedAtOpening("x", "is not a zip archive");
    expectRefusedAtOpening(std::string(100'000, 'x'), "is not a zip archive");
    expectRefusedAtOpening("\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1" + std::string(1000, '\0'),
                           "is not a zip archive but a compound file");
}

TEST_F(ZipArchiveTest, RefusesEveryTruncation) {
    const std::string bytes = buildZip({{"a", randomText(300), true}, {"b", "text"}});
    for (std::size_t length = 0; length < bytes.size(); ++length) {
        const std::string path = write(bytes.substr(0, length));
        EXPECT_THROW(zip::Archive{path}, std::runtime_error) << length;
    }
    expectRefusedAtOpening(bytes.substr(0, bytes.size() - 1), "truncated");
    expectRefusedAtOpening(bytes.substr(0, 100), "truncated");
}

TEST_F(ZipArchiveTest, RefusesAnArchiveWithBytesMissingInTheMiddle) {
    const std::string bytes = buildZip({{"a", randomText(3000)}, {"b", "text"}});
    const std::string path = write(bytes.substr(0, 500) + bytes.substr(1500));
    EXPECT_THROW(zip::Archive{path}, std::runtime_error);
}

TEST_F(ZipArchiveTest, NeverReturnsChangedContentWhicheverByteIsDamaged) {
    const std::string text = randomText(200);
    const std::string bytes = buildZip({{"a", text, true}, {"b", text, false}});
    for (std::size_t at = 0; at < bytes.size(); ++at) {
        std::string damaged = bytes;
        damaged[at] = static_cast<char>(damaged[at] ^ 0x55);
        try {
            zip::Archive archive(write(damaged));
            archive.requireWithinLimits(entriesOf(archive));
            for (const zip::Archive::Entry& entry : archive.entries()) {
                std::vector<std::uint8_t> out(entry.size);
                archive.read(entry, out);
                EXPECT_EQ(textOf(out), text) << "byte " << at;
            }
        } catch (const std::runtime_error&) {
        }
    }
}

TEST_F(ZipArchiveTest, RefusesADamagedChecksum) {
    ZipEntry entry{"a", "text"};
    entry.checksum = 1;
    expectRefusedAtReading(buildZip({entry}), "is damaged (CRC)");
    entry.deflated = true;
    expectRefusedAtReading(buildZip({entry}), "is damaged (CRC)");
}

TEST_F(ZipArchiveTest, RefusesAWrongSize) {
    for (const std::uint64_t size : {3U, 5U, 1000U}) {
        ZipEntry entry{"a", "text"};
        entry.size = size;
        expectRefusedAtReading(buildZip({entry}), "is damaged (wrong size)");
        entry.deflated = true;
        expectRefusedAtReading(buildZip({entry}), "is damaged (wrong size)");
    }
}

TEST_F(ZipArchiveTest, RefusesBrokenDeflateData) {
    ZipEntry entry{"a", "\xFF\xFF\xFF\xFF"};
    entry.method = 8;
    entry.size = 100;
    expectRefusedAtReading(buildZip({entry}), "its compressed data is broken");
}

TEST_F(ZipArchiveTest, RefusesEncryptedEntries) {
    ZipEntry entry{"a", "text"};
    entry.flags = 1;
    expectRefusedAtReading(buildZip({entry}), "is encrypted");
    entry.flags = 1 << 13;
    expectRefusedAtOpening(buildZip({entry}), "is encrypted");
}

TEST_F(ZipArchiveTest, RefusesUnknownMethodsByNumber) {
    ZipEntry entry{"a", "text"};
    entry.method = 14;
    expectRefusedAtReading(buildZip({entry}), "is compressed with the unknown method 14");
}

TEST_F(ZipArchiveTest, RefusesAnEntryWhoseHeaderIsNotWhereItShouldBe) {
    ZipEntry entry{"a", randomText(200)};
    entry.offset = 3;
    entry.compressedSize = 10;
    entry.size = 10;
    expectRefusedAtReading(buildZip({entry}), "no header where the directory says");
}

TEST_F(ZipArchiveTest, RefusesEntriesThatReachBehindTheData) {
    ZipEntry entry{"a", "text"};
    entry.offset = 10'000;
    expectRefusedAtOpening(buildZip({entry}), "\"a\" reaches past the end");
    entry.offset.reset();
    entry.compressedSize = 100;
    expectRefusedAtOpening(buildZip({entry}), "\"a\" reaches past the end");
    entry.isZip64 = true;
    entry.compressedSize = ~std::uint64_t{0} - 10;
    expectRefusedAtOpening(buildZip({entry}), "\"a\" reaches past the end");
}

TEST_F(ZipArchiveTest, RefusesOverlappingEntries) {
    ZipEntry second{"b", "text"};
    second.offset = 0;
    expectRefusedAtOpening(buildZip({{"a", "text"}, second}), "overlaps another entry");
    second.offset = 33;  // in the middle of the first
    expectRefusedAtOpening(buildZip({{"a", "text"}, second}), "overlaps another entry");
}

TEST_F(ZipArchiveTest, RefusesADamagedDirectory) {
    ZipOptions options;
    options.entryCount = 3;
    expectRefusedAtOpening(buildZip({{"a", "x"}, {"b", "x"}}, options), "no entry 3 of 3");
    options.entryCount = 1;
    expectRefusedAtOpening(buildZip({{"a", "x"}, {"b", "x"}}, options),
                           "more entries than it says");
    options = {};
    options.directoryOffset = 1;
    expectRefusedAtOpening(buildZip({{"a", "x"}}, options), "no entry 1 of 1");
    options = {};
    options.directorySize = 46;
    expectRefusedAtOpening(buildZip({{"abc", "x"}}, options), "its directory is cut off");
    options = {};
    options.directorySize = 1'000'000;
    expectRefusedAtOpening(buildZip({{"abc", "x"}}, options), "truncated");
}

TEST_F(ZipArchiveTest, RefusesBrokenZip64Records) {
    ZipEntry entry{"a", "text"};
    entry.size = 0xFFFFFFFF;
    expectRefusedAtOpening(buildZip({entry}), "\"a\" lacks its ZIP64 sizes");
    ZipOptions options;
    options.isZip64 = true;
    for (const std::uint64_t offset :
         {std::uint64_t{0}, std::uint64_t{1'000'000}, ~std::uint64_t{0}}) {
        options.zip64EndOffset = offset;
        expectRefusedAtOpening(buildZip({{"a", "x"}}, options), "ZIP64 end record is missing");
    }
    options.zip64EndOffset.reset();
    options.directoryOffset = ~std::uint64_t{0} - 5;
    expectRefusedAtOpening(buildZip({{"a", "x"}}, options), "reaches past its end record");
    options.directoryOffset.reset();
    options.directorySize = ~std::uint64_t{0} - 5;
    expectRefusedAtOpening(buildZip({{"a", "x"}}, options), "reaches past its end record");
}

TEST_F(ZipArchiveTest, RefusesArchivesInSeveralFiles) {
    ZipOptions options;
    options.disk = 2;
    expectRefusedAtOpening(buildZip({{"a", "x"}}, options), "split over several files");
}

TEST_F(ZipArchiveTest, RefusesMoreEntriesThanTheLimit) {
    std::vector<ZipEntry> entries(zip::maxEntries + 1);
    expectRefusedAtOpening(buildZip(entries), "has too many entries: 65535");
    ZipOptions options;
    options.isZip64 = true;
    entries.resize(100'000);
    expectRefusedAtOpening(buildZip(entries, options), "has too many entries: 100000");
    options.entryCount = std::uint64_t{1} << 40;
    expectRefusedAtOpening(buildZip({}, options), "has too many entries: 1099511627776");
}

TEST_F(ZipArchiveTest, AcceptsAsManyEntriesAsTheLimit) {
    EXPECT_EQ(
        zip::Archive(write(buildZip(std::vector<ZipEntry>(zip::maxEntries)))).entries().size(),
        zip::maxEntries);
}

TEST_F(ZipArchiveTest, RefusesAHugeDirectory) {
    ZipOptions options;
    options.prefix = std::string(zip::maxDirectoryBytes + 1, ' ');
    options.directoryOffset = 0;
    options.directorySize = options.prefix.size();
    expectRefusedAtOpening(buildZip({}, options), "has a directory of 67108865 bytes");
}

TEST_F(ZipArchiveTest, RefusesAnEntryBeyondTheLimitByItsDeclaredSize) {
    ZipEntry entry{"a", std::string(5'000'000, 'x')};
    entry.method = 8;
    entry.size = zip::maxEntryBytes + 1;
    expectRefusedByLimits(buildZip({entry}), "\"a\" is too large: 1073741825 bytes");
    entry.isZip64 = true;
    entry.size = std::uint64_t{4} << 30;
    expectRefusedByLimits(buildZip({entry}), "\"a\" is too large: 4294967296 bytes");
}

TEST_F(ZipArchiveTest, RefusesATotalBeyondTheLimit) {
    std::vector<ZipEntry> entries(3, {"a", std::string(5'000'000, 'x')});
    for (ZipEntry& entry : entries) {
        entry.method = 8;
        entry.size = zip::maxEntryBytes * 3 / 4;
    }
    expectRefusedByLimits(buildZip(entries), "is too large: it expands to 2415919104 bytes");
}

TEST_F(ZipArchiveTest, LimitsOnlyWhatIsAskedFor) {
    ZipEntry huge{"b", std::string(5'000'000, 'x')};
    huge.method = 8;
    huge.isZip64 = true;
    huge.size = std::uint64_t{4} << 30;
    const zip::Archive archive(write(buildZip({{"a", "text"}, huge})));
    const zip::Archive::Entry* const first = archive.entries().data();
    EXPECT_NO_THROW(archive.requireWithinLimits({&first, 1}));
    EXPECT_NO_THROW(archive.requireWithinLimits({}));
    EXPECT_THROW(archive.requireWithinLimits(entriesOf(archive)), std::runtime_error);
}

TEST_F(ZipArchiveTest, RefusesASizeToWhichTheDataCannotExpand) {
    ZipEntry entry{"a", std::string(1000, 'x')};
    entry.method = 8;
    entry.size = 1000 * 1032 + 2000;
    expectRefusedByLimits(buildZip({entry}), "\"a\" has a wrong size");
}

TEST_F(ZipArchiveTest, AcceptsTheBestThatDeflateCanDo) {
    const std::string zeros(30'000'000, '\0');
    EXPECT_EQ(readOnly(buildZip({{"a", zeros, true}})), zeros);
}

TEST_F(ZipArchiveTest, RefusesABombBeforeExpandingAnyOfIt) {
    const std::string bytes = buildZip({{"a", std::string(100 << 20, '\0'), true}});
    expectRefusedByLimits(bytes, "expands too much: from");
}

TEST_F(ZipArchiveTest, LooksForTheDirectoryOnceHoweverManyEndRecordsThereAre) {
    // The directory is 3 MB, and 2900 end records name it: reading it for each would take minutes.
    std::string bytes = buildZip(std::vector<ZipEntry>(zip::maxEntries));
    const std::string end = bytes.substr(bytes.size() - 22);
    for (int i = 0; i < 2900; ++i) {
        bytes += end;
    }
    EXPECT_EQ(zip::Archive(write(bytes)).entries().size(), zip::maxEntries);
}

TEST_F(ZipArchiveTest, RefusesFilesThatCannotBeOpened) {
    EXPECT_THAT([&] { zip::Archive((folder_.path() / "none").string()); },
                ThrowsMessage<std::runtime_error>(HasSubstr("No such file")));
    EXPECT_THAT([&] { zip::Archive(folder_.path().string()); },
                ThrowsMessage<std::runtime_error>(HasSubstr("is a folder")));
}

TEST_F(ZipArchiveTest, RefusesPipesAndDevicesWithoutWaiting) {
    const std::string pipe = (folder_.path() / "pipe").string();
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    EXPECT_THAT([&] { zip::Archive{pipe}; },
                ThrowsMessage<std::runtime_error>(HasSubstr("is not a regular file")));
    EXPECT_THAT([&] { zip::Archive("/dev/zero"); },
                ThrowsMessage<std::runtime_error>(HasSubstr("is not a regular file")));
}

}  // namespace
}  // namespace test
