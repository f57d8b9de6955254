// SPDX-License-Identifier: Apache-2.0
#include "host/manual/described_program.h"

#include <CLI/CLI.hpp>

#include "host/commands/command_line.h"

namespace host {

namespace {

std::vector<DescribedOption> optionsOf(const CLI::App& app) {
    std::vector<DescribedOption> options;
    for (const CLI::Option* option : app.get_options()) {
        if (!option->get_positional()) {
            options.push_back({option->get_snames(), option->get_lnames(), option->get_type_name(),
                               option->get_description(), option == app.get_help_ptr()});
        }
    }
    return options;
}

std::vector<DescribedArgument> argumentsOf(const CLI::App& command) {
    std::vector<DescribedArgument> arguments;
    for (const CLI::Option* option : command.get_options()) {
        if (option->get_positional()) {
            arguments.push_back({option->get_name(true), option->get_description(),
                                 option->get_expected_max() > 1});
        }
    }
    return arguments;
}

}  // namespace

std::vector<std::string> DescribedOption::names() const {
    std::vector<std::string> names;
    for (const std::string& name : shortNames) {
        names.push_back("-" + name);
    }
    for (const std::string& name : longNames) {
        names.push_back("--" + name);
    }
    return names;
}

DescribedProgram describedProgram() {
    CLI::App app;
    CommandLine line;
    describe(app, line);
    DescribedProgram program{app.version(), app.get_description(), optionsOf(app), {}};
    for (const CLI::App* command : app.get_subcommands({})) {
        program.commands.push_back({command->get_name(), command->get_description(),
                                    optionsOf(*command), argumentsOf(*command)});
    }
    return program;
}

}  // namespace host
