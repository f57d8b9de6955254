// SPDX-License-Identifier: Apache-2.0
#include <functional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "host/commands/command_line.h"
#include "host/manual/manual.h"

namespace host {

namespace {

using Condition = std::function<bool(const DescribedOption&)>;

// The names of the options that `condition` holds for, put together with `separator`.
std::string namesOfAll(const std::vector<DescribedOption>& options, const Condition& condition,
                       const std::string& separator) {
    std::set<std::string> unique;
    for (const DescribedOption& option : options) {
        if (condition(option)) {
            const std::vector<std::string> names = option.names();
            unique.insert(names.begin(), names.end());
        }
    }
    std::string text;
    for (const std::string& name : unique) {
        text += (text.empty() ? "" : separator) + name;
    }
    return text;
}

std::string namesOfAll(const std::vector<DescribedOption>& options) {
    return namesOfAll(
        options, [](const DescribedOption&) { return true; }, " ");
}

std::vector<DescribedOption> optionsOfAllCommands(const DescribedProgram& program) {
    std::vector<DescribedOption> options = program.options;
    for (const DescribedCommand& command : program.commands) {
        options.insert(options.end(), command.options.begin(), command.options.end());
    }
    return options;
}

std::string commandNames(const DescribedProgram& program, const std::string& separator) {
    std::string text;
    for (const DescribedCommand& command : program.commands) {
        text += (text.empty() ? "" : separator) + command.name;
    }
    return text;
}

// `text` with `escape` before each of `characters`.
std::string escaped(const std::string& text, std::string_view characters,
                    const std::string& escape) {
    std::string result;
    for (const char character : text) {
        if (characters.find(character) != std::string_view::npos) {
            result += escape;
        }
        result += character;
    }
    return result;
}

// One of the arguments of zsh's _arguments: '(-h --help)'{-h,--help}'[Print this help]'.
std::string zshArgument(const DescribedOption& option) {
    const std::vector<std::string> names = option.names();
    std::string all;
    for (const std::string& name : names) {
        all += (all.empty() ? "" : " ") + name;
    }
    std::string value;
    if (option.takesValue()) {
        const char* const completer = option.takesFolder() ? "_files -/"
                                      : option.takesFile() ? "_files"
                                                           : " ";
        value = ":" + option.value + ":" + completer;
    }
    // In single quotes, inside brackets.
    const std::string description = escaped(escaped(option.description, "[]\\", "\\"), "'", "'\\'");
    std::string text;
    for (const std::string& name : names) {
        text += " \\\n        '*" + name + "[" + description + "]" + value + "'";
    }
    return text;
}

std::string zshArguments(const std::vector<DescribedOption>& options) {
    std::string text;
    for (const DescribedOption& option : options) {
        text += zshArgument(option);
    }
    return text;
}

// A line for fish that completes `option` where `condition`, in fish, holds.
std::string fishLine(const DescribedOption& option, const std::string& condition) {
    std::string line = std::string("complete -c ") + programName + condition;
    for (const std::string& name : option.shortNames) {
        line += " -s " + name;
    }
    for (const std::string& name : option.longNames) {
        line += " -l " + name;
    }
    if (option.takesFolder()) {
        line += " -x -a '(__fish_complete_directories)'";
    } else if (option.takesFile()) {
        line += " -r -F";
    } else if (option.takesValue()) {
        line += " -x";
    }
    return line + " -d '" + escaped(option.description, "'\\", "\\") + "'\n";
}

}  // namespace

std::string bashCompletion(const DescribedProgram& program) {
    const std::vector<DescribedOption> all = optionsOfAllCommands(program);
    const auto takesOther = [](const DescribedOption& option) {
        return option.takesValue() && !option.takesFile() && !option.takesFolder();
    };
    std::string optionCases;
    for (const DescribedCommand& command : program.commands) {
        optionCases +=
            "        " + command.name + ") words+=' " + namesOfAll(command.options) + "' ;;\n";
    }
    return "# bash completion for serialization_host. Generated from its command line.\n"
           "_serialization_host() {\n"
           "    local current=${COMP_WORDS[COMP_CWORD]} word command=\n"
           "    COMPREPLY=()\n"
           "    case ${COMP_WORDS[COMP_CWORD-1]} in\n"
           "        " +
           namesOfAll(all, &DescribedOption::takesFolder, "|") +
           ")\n"
           "            compopt -o filenames\n"
           "            mapfile -t COMPREPLY < <(compgen -d -- \"$current\")\n"
           "            return ;;\n"
           "        " +
           namesOfAll(all, &DescribedOption::takesFile, "|") +
           ")\n"
           "            compopt -o filenames\n"
           "            mapfile -t COMPREPLY < <(compgen -f -- \"$current\")\n"
           "            return ;;\n"
           "        " +
           namesOfAll(all, takesOther, "|") +
           ")\n"
           "            return ;;\n"
           "    esac\n"
           "    for word in \"${COMP_WORDS[@]:1:COMP_CWORD-1}\"; do\n"
           "        case $word in\n"
           "            " +
           commandNames(program, "|") +
           ") command=$word; break ;;\n"
           "        esac\n"
           "    done\n"
           "    local words='" +
           namesOfAll(program.options) +
           "'\n"
           "    case $command in\n" +
           optionCases + "        *) words+=' " + commandNames(program, " ") +
           "' ;;\n"
           "    esac\n"
           "    if [[ -z $command || $current == -* ]]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W \"$words\" -- \"$current\")\n"
           "    else\n"
           "        compopt -o filenames\n"
           "        mapfile -t COMPREPLY < <(compgen -f -- \"$current\")\n"
           "    fi\n"
           "}\n"
           "complete -F _serialization_host serialization_host\n";
}

std::string zshCompletion(const DescribedProgram& program) {
    std::string descriptions;
    std::string cases;
    for (const DescribedCommand& command : program.commands) {
        descriptions +=
            "    '" + command.name + ":" + escaped(command.description, "'", "'\\'") + "'\n";
        const bool takesFiles = !command.arguments.empty();
        cases += "        " + command.name + ")\n            _arguments" +
                 zshArguments(program.options) + zshArguments(command.options) +
                 (takesFiles ? " \\\n        '*:FILE:_files'" : "") + " ;;\n";
    }
    return "#compdef serialization_host\n"
           "# Generated from the command line of serialization_host.\n"
           "local curcontext=$curcontext state line\n"
           "local -a commands=(\n" +
           descriptions +
           ")\n"
           "_arguments -C" +
           zshArguments(program.options) +
           " \\\n        '1:COMMAND:->command' '*::ARGUMENT:->argument' && return\n"
           "if [[ $state == command ]]; then\n"
           "    _describe COMMAND commands\n"
           "else\n"
           "    case $line[1] in\n" +
           cases +
           "    esac\n"
           "fi\n";
}

std::string fishCompletion(const DescribedProgram& program) {
    std::string text =
        "# fish completion for serialization_host. Generated from its command line.\n";
    for (const DescribedOption& option : program.options) {
        text += fishLine(option, "");
    }
    for (const DescribedCommand& command : program.commands) {
        const std::string name = command.name;
        text += std::string("complete -c ") + programName + " -n __fish_use_subcommand -f -a " +
                name + " -d '" + escaped(command.description, "'\\", "\\") + "'\n";
        for (const DescribedOption& option : command.options) {
            text += fishLine(option, " -n '__fish_seen_subcommand_from " + name + "'");
        }
    }
    return text;
}

}  // namespace host
