// SPDX-License-Identifier: Apache-2.0
// What manual pages and completions need to know of a described command line.
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

namespace host {

inline std::vector<const CLI::App*> commandsOf(const CLI::App& app) {
    return app.get_subcommands([](const CLI::App*) { return true; });
}

/// The options of `app` itself, without those of its commands.
inline std::vector<const CLI::Option*> optionsOf(const CLI::App& app) {
    return app.get_options([](const CLI::Option* option) { return !option->get_positional(); });
}

/// The arguments of `app` that have no name on the command line.
inline std::vector<const CLI::Option*> argumentsOf(const CLI::App& app) {
    return app.get_options([](const CLI::Option* option) { return option->get_positional(); });
}

/// All names of `option`, with their dashes.
inline std::vector<std::string> namesOf(const CLI::Option& option) {
    std::vector<std::string> names;
    for (const std::string& name : option.get_snames()) {
        names.push_back("-" + name);
    }
    for (const std::string& name : option.get_lnames()) {
        names.push_back("--" + name);
    }
    return names;
}

inline bool takesValue(const CLI::Option& option) {
    return !option.get_type_name().empty();
}

inline bool takesFolder(const CLI::Option& option) {
    return takesValue(option) && option.get_type_name() == "DIR";
}

inline bool takesFile(const CLI::Option& option) {
    return takesValue(option) &&
           (option.get_type_name() == "FILE" || option.get_type_name() == "PATH");
}

}  // namespace host
