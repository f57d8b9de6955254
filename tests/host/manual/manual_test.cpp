// SPDX-License-Identifier: Apache-2.0
#include "host/manual/manual.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

#include "host/commands/command_line.h"
#include "host/manual/described_program.h"

namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

// The part of `text` from `from` to `to`, or to its end.
std::string between(const std::string& text, const std::string& from, const std::string& to) {
    const std::size_t begin = text.find(from);
    return begin == std::string::npos ? "" : text.substr(begin, text.find(to, begin + 1) - begin);
}

class Manual : public testing::Test {
protected:
    Manual() { host::describe(app, line); }

    std::vector<const CLI::App*> commands() const {
        return app.get_subcommands([](const CLI::App*) { return true; });
    }

    // What the texts are compared with: each option as the parser knows it.
    CLI::App app;
    host::CommandLine line;
    host::DescribedProgram program = host::describedProgram();
};

// Expects each option of each command in the command's part of the text, in the form that `written`
// gives it. Returns how many there are.
template <typename PartOf, typename Written>
std::size_t expectAllOptions(const std::vector<const CLI::App*>& commands, PartOf partOf,
                             Written written) {
    std::size_t options = 0;
    for (const CLI::App* command : commands) {
        const std::string part = partOf(command->get_name());
        for (const CLI::Option* option : command->get_options()) {
            for (const std::string& name : option->get_lnames()) {
                if (name != "help") {
                    EXPECT_THAT(part, HasSubstr(written(name))) << command->get_name();
                    ++options;
                }
            }
        }
    }
    return options;
}

std::string roff(std::string name) {
    for (std::size_t at = name.find('-'); at != std::string::npos; at = name.find('-', at + 2)) {
        name.insert(at, "\\");
    }
    return "\\fB\\-\\-" + name + "\\fR";
}

TEST_F(Manual, PageHasEachOptionOfEachCommand) {
    const std::string page = host::manualPage(program);
    const auto options = expectAllOptions(
        commands(),
        [&](const std::string& command) { return between(page, ".SS " + command + " ", "\n.S"); },
        roff);
    EXPECT_GT(options, 30U);
    EXPECT_THAT(between(page, ".SH OPTIONS", "\n.SH"),
                AllOf(HasSubstr(roff("bundle")), HasSubstr(roff("log-level")),
                      HasSubstr(roff("memory-limit")), HasSubstr(roff("help")),
                      HasSubstr(roff("version"))));
}

TEST_F(Manual, PageNamesValuesArgumentsAndExitStatuses) {
    const std::string page = host::manualPage(program);
    EXPECT_THAT(page, AllOf(HasSubstr("\n\\fB\\-\\-timeout\\fR \\fISECONDS\\fR\n"),
                            HasSubstr("\n.SS read [OPTION...] FILE...\n"),
                            HasSubstr("\n.SS history [OPTION...] FILE\n"),
                            HasSubstr("\n.SH EXIT STATUS\n0 when all is done")));
}

TEST_F(Manual, PageHasTextsAsTheyStand) {
    program.options.push_back({{}, {"odd"}, "", ".like a request, or 'another\\\n'third"});
    EXPECT_THAT(host::manualPage(program),
                HasSubstr("\n\\&.like a request, or 'another\\e\n.br\n\\&'third\n"));
}

TEST_F(Manual, FishCompletesEachOptionOfEachCommand) {
    const std::string text = host::fishCompletion(program);
    std::size_t options = 0;
    for (const CLI::App* command : commands()) {
        const std::string condition =
            "-n '__fish_seen_subcommand_from " + command->get_name() + "'";
        options += expectAllOptions(
            {command}, [&](const std::string&) { return text; },
            [&](const std::string& name) { return condition + " -l " + name + " "; });
    }
    EXPECT_GT(options, 30U);
}

}  // namespace
