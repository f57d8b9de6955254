// SPDX-License-Identifier: Apache-2.0
// BundleRunner, whichever framework it is built on. SAMPLE_BUNDLE is the file of a bundle whose
// behaviour each test chooses.

#include "framework/bundle_runner.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <stdexcept>
#include <string>

#include "tests/framework/bundle_failure.h"
#include "tests/framework/sample_bundle_control.h"
#include "tests/support/temporary_directory.h"

namespace framework {
namespace {

using sample::Behaviour;
using sample::control;
using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

const std::filesystem::path sampleBundle = SAMPLE_BUNDLE;

class BundleRunnerTest : public testing::Test {
protected:
    BundleRunnerTest() { control() = {}; }
};

TEST_F(BundleRunnerTest, SetsTheContextThenCreatesAndStartsTheActivator) {
    const BundleRunner runner(sampleBundle);
    EXPECT_THAT(control().events, ElementsAre("set context", "create", "start"));
}

TEST_F(BundleRunnerTest, StopsAndDestroysTheActivatorAtItsOwnEnd) {
    {
        const BundleRunner runner(sampleBundle);
        control().events.clear();
    }
    EXPECT_THAT(control().events, ElementsAre("stop", "destroy", "clear context"));
}

TEST_F(BundleRunnerTest, StopsTheBundleOnce) {
    {
        BundleRunner runner(sampleBundle);
        control().events.clear();
        runner.stop();
        EXPECT_THAT(control().events, ElementsAre("stop", "destroy", "clear context"));
        runner.stop();
    }
    EXPECT_THAT(control().events, ElementsAre("stop", "destroy", "clear context"));
}

TEST_F(BundleRunnerTest, RunsABundleAgain) {
    { const BundleRunner runner(sampleBundle); }
    control().events.clear();
    const BundleRunner runner(sampleBundle);
    EXPECT_THAT(control().events, ElementsAre("set context", "create", "start"));
}

TEST_F(BundleRunnerTest, TakesARelativePathFromTheWorkingFolder) {
    const std::filesystem::path before = std::filesystem::current_path();
    std::filesystem::current_path(sampleBundle.parent_path());
    EXPECT_NO_THROW(BundleRunner(sampleBundle.filename()));
    std::filesystem::current_path(before);
}

TEST_F(BundleRunnerTest, SaysThatThereIsNoFile) {
    EXPECT_EQ(failureOf("/no/such/folder/libbundle.so"),
              "no bundle at /no/such/folder/libbundle.so");
}

TEST_F(BundleRunnerTest, NamesTheFileThatIsNoLibrary) {
    const test::TemporaryDirectory folder;
    const std::filesystem::path text = folder / "libtext.so";
    test::writeFile(text,
                    "This is a text, and it is long enough to hold an ELF header, was it one.");
    EXPECT_THAT(failureOf(text),
                AllOf(HasSubstr("cannot load bundle "), HasSubstr(text.string() + ": ")));
}

TEST_F(BundleRunnerTest, NamesTheFolderThatIsNoLibrary) {
    EXPECT_THAT(failureOf(testing::TempDir()),
                HasSubstr("cannot load bundle " + testing::TempDir()));
}

TEST_F(BundleRunnerTest, SaysWhyTheStartFailed) {
    control().start = Behaviour::throwException;
    EXPECT_THAT(failureOf(sampleBundle),
                AllOf(HasSubstr("cannot start bundle " + sampleBundle.string() + ": "),
                      HasSubstr("the sample bundle does not feel like it")));
}

TEST_F(BundleRunnerTest, ReportsAStartThatThrowsNoStandardException) {
    control().start = Behaviour::throwNumber;
    EXPECT_THAT(failureOf(sampleBundle),
                HasSubstr("cannot start bundle " + sampleBundle.string() + ": "));
}

TEST_F(BundleRunnerTest, DestroysTheActivatorWhoseStartFailed) {
    control().start = Behaviour::throwException;
    failureOf(sampleBundle);
    EXPECT_THAT(control().events, AllOf(Contains("destroy"), Not(Contains("stop"))));
}

TEST_F(BundleRunnerTest, SaysWhyTheStopFailedAndDestroysTheActivator) {
    control().stop = Behaviour::throwException;
    BundleRunner runner(sampleBundle);
    std::string failure;
    try {
        runner.stop();
    } catch (const std::runtime_error& error) {
        failure = error.what();
    }
    EXPECT_THAT(failure, AllOf(HasSubstr("cannot stop bundle " + sampleBundle.string() + ": "),
                               HasSubstr("the sample bundle does not feel like it")));
    EXPECT_THAT(control().events, Contains("destroy"));
}

TEST_F(BundleRunnerTest, KeepsAFailureToStopToItselfAtItsOwnEnd) {
    control().stop = Behaviour::throwNumber;
    { const BundleRunner runner(sampleBundle); }
    EXPECT_THAT(control().events, Contains("destroy"));
}

}  // namespace
}  // namespace framework
