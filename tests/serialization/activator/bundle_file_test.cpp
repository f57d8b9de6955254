// SPDX-License-Identifier: Apache-2.0
// The bundle's file: what it exports, and the manifest in it. BUNDLE is the file.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/package/zip/archive.h"
#include "tests/serialization/activator/elf_file.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace zip = platform::package::zip;
using test::ElfFile;
using test::ElfSymbol;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::UnorderedElementsAre;

std::vector<std::string> namesOf(const std::vector<ElfSymbol>& symbols, bool defined) {
    std::vector<std::string> names;
    for (const ElfSymbol& symbol : symbols) {
        if (symbol.defined == defined) {
            names.push_back(symbol.name);
        }
    }
    return names;
}

TEST(BundleFile, ExportsItsThreeEntryPointsAndNothingElse) {
    EXPECT_THAT(
        namesOf(ElfFile(BUNDLE).dynamicSymbols(), true),
        UnorderedElementsAre("_us_create_activator_com_vorplanex_serialization",
                             "_us_destroy_activator_com_vorplanex_serialization",
                             "_us_set_bundle_context_instance_com_vorplanex_serialization"));
}

TEST(BundleFile, NeedsNothingOfTheFramework) {
    const std::vector<std::string> needed = namesOf(ElfFile(BUNDLE).dynamicSymbols(), false);
    EXPECT_THAT(needed, Each(Not(HasSubstr("cppmicroservices"))));
    EXPECT_THAT(needed, Contains(HasSubstr("createMessageService")));
}

TEST(BundleFile, HasTheManifestInInitialisedData) {
    const Elf64_Shdr section = ElfFile(BUNDLE).section(".us_resources");
    EXPECT_EQ(section.sh_type, Elf64_Word{SHT_PROGBITS});
    EXPECT_NE(section.sh_flags & SHF_ALLOC, 0u);
}

// The archive in the bundle's file, read by itself.
class ManifestArchive : public testing::Test {
protected:
    std::vector<std::string> entries() const {
        std::vector<std::string> names;
        for (const zip::Archive::Entry& entry : archive_.entries()) {
            names.push_back(entry.name);
        }
        return names;
    }

    std::string manifest() {
        const zip::Archive::Entry& entry = archive_.entries().at(1);
        std::vector<std::uint8_t> bytes(entry.size);
        archive_.read(entry, bytes);
        return {bytes.begin(), bytes.end()};
    }

private:
    std::string extracted() const {
        const std::filesystem::path path = folder_ / "resources.zip";
        const ElfFile bundle(BUNDLE);
        test::writeFile(path, bundle.content(bundle.section(".us_resources")));
        return path;
    }

    const test::TemporaryDirectory folder_;
    zip::Archive archive_{extracted()};
};

TEST_F(ManifestArchive, HoldsTheFolderAndTheManifest) {
    EXPECT_THAT(entries(), ElementsAre("com_vorplanex_serialization/",
                                       "com_vorplanex_serialization/manifest.json"));
}

TEST_F(ManifestArchive, HoldsTheManifestThatTheFrameworkExpects) {
    EXPECT_EQ(json::serialize(json::parse(manifest())),
              R"({"bundle.activator":true,)"
              R"("bundle.symbolic_name":"com_vorplanex_serialization",)"
              R"("bundle.vendor":"The Vorplanex Company",)"
              R"("kq":{"clientdir":"src/editorservices/serialization",)"
              R"("component":{"name":"editorservices/serialization"},)"
              R"("installpath":"editorservices/serialization/libcom_vorplanex_serialization.so",)"
              R"("module":{"name":"serialization"}}})");
}

TEST_F(ManifestArchive, NamesTheFileThatItIsIn) {
    EXPECT_THAT(manifest(), HasSubstr(std::filesystem::path(BUNDLE).filename().string()));
}

}  // namespace
