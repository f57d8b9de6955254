// SPDX-License-Identifier: Apache-2.0
// The folder in which a guard keeps locks and earlier versions.
#include "host/guard/guard.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <stdexcept>
#include <vector>

#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

constexpr fs::perms openToAll = fs::perms(01777);

class GuardFolder : public testing::Test {
protected:
    static host::Guard make(const fs::path& folder, const std::vector<fs::path>& roots = {}) {
        host::GuardOptions options;
        options.folder = folder;
        return host::makeGuard(options, roots);
    }

    static fs::perms permissionsOf(const fs::path& path) { return fs::status(path).permissions(); }

    const test::TemporaryDirectory scratch_;
    const fs::path folder_ = scratch_ / "folder";
};

TEST_F(GuardFolder, IsPrivateWhenItIsMade) {
    make(folder_);
    EXPECT_EQ(permissionsOf(folder_), fs::perms::owner_all);
}

TEST_F(GuardFolder, KeepsItsPermissionsWhenItWasThereBefore) {
    fs::create_directory(folder_);
    fs::permissions(folder_, openToAll);
    make(folder_);
    EXPECT_EQ(permissionsOf(folder_), openToAll);
    EXPECT_EQ(permissionsOf(folder_ / "versions"), fs::perms::owner_all);
    EXPECT_EQ(permissionsOf(folder_ / "locks"), fs::perms::owner_read | fs::perms::owner_write);
}

TEST_F(GuardFolder, IsNotTouchedWhereClientsCouldReachIt) {
    EXPECT_THROW(make(folder_, {scratch_.path()}), std::runtime_error);
    EXPECT_FALSE(fs::exists(folder_));
}

}  // namespace
