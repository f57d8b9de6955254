// SPDX-License-Identifier: Apache-2.0
// The program's commands and options as its manual page and completions tell of them. A copy, so
// that what writes these need not include the parser, whose header takes a compiler seconds.
#pragma once

#include <string>
#include <vector>

namespace host {

/// An option of the program or of a command.
struct DescribedOption {
    std::vector<std::string> shortNames;  ///< Without their dashes, as those of `longNames`.
    std::vector<std::string> longNames;
    std::string value;  ///< What its value is, such as "FILE"; empty where it takes none.
    std::string description;
    bool isHelp = false;  ///< Whether it is the one that each command has.

    /// All its names, with their dashes.
    std::vector<std::string> names() const;

    bool takesValue() const { return !value.empty(); }
    bool takesFolder() const { return value == "DIR"; }
    bool takesFile() const { return value == "FILE" || value == "PATH"; }
};

/// An argument that has no name on the command line.
struct DescribedArgument {
    std::string name;
    std::string description;
    bool isRepeated = false;
};

struct DescribedCommand {
    std::string name;
    std::string description;
    std::vector<DescribedOption> options;
    std::vector<DescribedArgument> arguments;
};

struct DescribedProgram {
    std::string version;
    std::string description;
    std::vector<DescribedOption> options;  ///< Those that stand before or behind each command.
    std::vector<DescribedCommand> commands;
};

/// The program as its command line is described (host/commands/command_line.h).
DescribedProgram describedProgram();

}  // namespace host
