// SPDX-License-Identifier: Apache-2.0
// What the tests of confinement begin with.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>

#include "host/limits/confinement.h"
#include "tests/support/temporary_directory.h"

namespace test {

/// A folder to grant and one beside it, each with an empty folder in it. Skips its tests where
/// threads cannot be confined.
class TwoFolders : public testing::Test {
protected:
    void SetUp() override {
        if (const auto reason = host::whyConfinementIsUnavailable()) {
            GTEST_SKIP() << *reason;
        }
        for (const std::filesystem::path& folder : {inside, outside}) {
            std::filesystem::create_directories(folder / "folder");
        }
    }

    /// Reading and writing within `inside`, as kernels of `version` can grant it.
    host::Confinement readWrite(int version = host::confinementVersion()) const {
        return host::Confinement({.readWrite = {inside}, .readOnly = {}}, version);
    }

    const TemporaryDirectory scratch;
    const std::filesystem::path inside = scratch / "inside";
    const std::filesystem::path outside = scratch / "outside";
};

}  // namespace test
