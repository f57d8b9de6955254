// SPDX-License-Identifier: Apache-2.0
// What BundleRunner does in a build without CppMicroServices. INCOMPLETE_BUNDLES is the folder of
// the libraries without_<function>, each of which lacks that one of a bundle's functions.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include "framework/bundle_runner.h"
#include "tests/framework/bundle_failure.h"
#include "tests/framework/sample_bundle_control.h"
#include "tests/support/process_state.h"

namespace framework {
namespace {

using sample::Behaviour;
using sample::control;

const std::filesystem::path sampleBundle = SAMPLE_BUNDLE;

class DlopenBundleRunnerTest : public testing::Test {
protected:
    DlopenBundleRunnerTest() { control() = {}; }
};

class IncompleteBundle : public testing::TestWithParam<std::string> {};

TEST_P(IncompleteBundle, IsNamedWithTheFunctionThatItLacks) {
    const std::string library =
        (std::filesystem::path(INCOMPLETE_BUNDLES) / ("libwithout_" + GetParam() + ".so")).string();
    EXPECT_EQ(failureOf(library), library + " is not a bundle: it has no function _us_" +
                                      GetParam() + "_without_" + GetParam());
}

INSTANTIATE_TEST_SUITE_P(Lacking, IncompleteBundle,
                         testing::Values("set_bundle_context_instance", "create_activator",
                                         "destroy_activator"),
                         [](const auto& bundle) { return bundle.param; });

TEST_F(DlopenBundleRunnerTest, SaysThatNoActivatorWasCreated) {
    control().create = Behaviour::createNothing;
    EXPECT_EQ(failureOf(sampleBundle),
              "cannot start bundle " + sampleBundle.string() + ": it created no activator");
}

TEST_F(DlopenBundleRunnerTest, CallsAnExceptionWithoutATextUnknown) {
    control().start = Behaviour::throwNumber;
    EXPECT_EQ(failureOf(sampleBundle),
              "cannot start bundle " + sampleBundle.string() + ": unknown exception");
}

TEST_F(DlopenBundleRunnerTest, UnloadsTheLibraryAtItsOwnEnd) {
    {
        const BundleRunner runner(sampleBundle);
        ASSERT_TRUE(test::isLoaded(sampleBundle));
    }
    EXPECT_FALSE(test::isLoaded(sampleBundle));
}

TEST_F(DlopenBundleRunnerTest, UnloadsTheLibraryWhoseStartFailed) {
    control().start = Behaviour::throwException;
    failureOf(sampleBundle);
    EXPECT_FALSE(test::isLoaded(sampleBundle));
}

}  // namespace
}  // namespace framework
