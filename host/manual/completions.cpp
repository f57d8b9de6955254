// SPDX-License-Identifier: Apache-2.0
#include <functional>
#include <set>
#include <string_view>

#include "host/commands/command_line.h"
#include "host/manual/described_options.h"
#include "host/manual/manual.h"

namespace host {

namespace {

using Condition = std::function<bool(const CLI::Option&)>;

// The names of the options that `condition` holds for, put together with `separator`.
std::string namesOfAll(const std::vector<const CLI::Option*>& options, const Condition& condition,
                       const std::string& separator) {
    std::set<std::string> unique;
    for (const CLI::Option* option : options) {
        if (condition(*option)) {
            const std::vector<std::string> names = namesOf(*option);
            unique.insert(names.begin(), names.end());
        }
    }
    std::string text;
    for (const std::string& name : unique) {
        text += (text.empty() ? "" : separator) + name;
    }
    return text;
}

std::string namesOfAll(const CLI::App& app) {
    return namesOfAll(
        optionsOf(app), [](const CLI::Option&) { return true; }, " ");
}

std::vector<const CLI::Option*> optionsOfAllCommands(const CLI::App& app) {
    std::vector<const CLI::Option*> options = optionsOf(app);
    for (const CLI::App* command : commandsOf(app)) {
        const std::vector<const CLI::Option*> more = optionsOf(*command);
        options.insert(options.end(), more.begin(), more.end());
    }
    return options;
}

std::string commandNames(const CLI::App& app, const std::string& separator) {
    std::string text;
    for (const CLI::App* command : commandsOf(app)) {
        text += (text.empty() ? "" : separator) + command->get_name();
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
std::string zshArgument(const CLI::Option& option) {
    const std::vector<std::string> names = namesOf(option);
    std::string all;
    for (const std::string& name : names) {
        all += (all.empty() ? "" : " ") + name;
    }
    std::string value;
    if (takesValue(option)) {
        const char* const completer = takesFolder(option) ? "_files -/"
                                      : takesFile(option) ? "_files"
                                                          : " ";
        value = ":" + option.get_type_name() + ":" + completer;
    }
    // In single quotes, inside brackets.
    const std::string description =
        escaped(escaped(option.get_description(), "[]\\", "\\"), "'", "'\\'");
    std::string text;
    for (const std::string& name : names) {
        text += " \\\n        '*" + name + "[" + description + "]" + value + "'";
    }
    return text;
}

std::string zshArguments(const CLI::App& app) {
    std::string text;
    for (const CLI::Option* option : optionsOf(app)) {
        text += zshArgument(*option);
    }
    return text;
}

// A line for fish that completes `option` where `condition`, in fish, holds.
std::string fishLine(const CLI::Option& option, const std::string& condition) {
    std::string line = std::string("complete -c ") + programName + condition;
    for (const std::string& name : option.get_snames()) {
        line += " -s " + name;
    }
    for (const std::string& name : option.get_lnames()) {
        line += " -l " + name;
    }
    if (takesFolder(option)) {
        line += " -x -a '(__fish_complete_directories)'";
    } else if (takesFile(option)) {
        line += " -r -F";
    } else if (takesValue(option)) {
        line += " -x";
    }
    return line + " -d '" + escaped(option.get_description(), "'\\", "\\") + "'\n";
}

}  // namespace

std::string bashCompletion(const CLI::App& app) {
    const std::vector<const CLI::Option*> all = optionsOfAllCommands(app);
    const auto takesOther = [](const CLI::Option& option) {
        return takesValue(option) && !takesFile(option) && !takesFolder(option);
    };
    std::string optionCases;
    for (const CLI::App* command : commandsOf(app)) {
        optionCases +=
            "        " + command->get_name() + ") words+=' " + namesOfAll(*command) + "' ;;\n";
    }
    return "# bash completion for serialization_host. Generated from its command line.\n"
           "_serialization_host() {\n"
           "    local current=${COMP_WORDS[COMP_CWORD]} word command=\n"
           "    COMPREPLY=()\n"
           "    case ${COMP_WORDS[COMP_CWORD-1]} in\n"
           "        " +
           namesOfAll(all, takesFolder, "|") +
           ")\n"
           "            compopt -o filenames\n"
           "            mapfile -t COMPREPLY < <(compgen -d -- \"$current\")\n"
           "            return ;;\n"
           "        " +
           namesOfAll(all, takesFile, "|") +
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
           commandNames(app, "|") +
           ") command=$word; break ;;\n"
           "        esac\n"
           "    done\n"
           "    local words='" +
           namesOfAll(app) +
           "'\n"
           "    case $command in\n" +
           optionCases + "        *) words+=' " + commandNames(app, " ") +
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

std::string zshCompletion(const CLI::App& app) {
    std::string descriptions;
    std::string cases;
    for (const CLI::App* command : commandsOf(app)) {
        descriptions += "    '" + command->get_name() + ":" +
                        escaped(command->get_description(), "'", "'\\'") + "'\n";
        const bool takesFiles = !argumentsOf(*command).empty();
        cases += "        " + command->get_name() + ")\n            _arguments" +
                 zshArguments(app) + zshArguments(*command) +
                 (takesFiles ? " \\\n        '*:FILE:_files'" : "") + " ;;\n";
    }
    return "#compdef serialization_host\n"
           "# Generated from the command line of serialization_host.\n"
           "local curcontext=$curcontext state line\n"
           "local -a commands=(\n" +
           descriptions +
           ")\n"
           "_arguments -C" +
           zshArguments(app) +
           " \\\n        '1:COMMAND:->command' '*::ARGUMENT:->argument' && return\n"
           "if [[ $state == command ]]; then\n"
           "    _describe COMMAND commands\n"
           "else\n"
           "    case $line[1] in\n" +
           cases +
           "    esac\n"
           "fi\n";
}

std::string fishCompletion(const CLI::App& app) {
    std::string text =
        "# fish completion for serialization_host. Generated from its command line.\n";
    for (const CLI::Option* option : optionsOf(app)) {
        text += fishLine(*option, "");
    }
    for (const CLI::App* command : commandsOf(app)) {
        const std::string name = command->get_name();
        text += std::string("complete -c ") + programName + " -n __fish_use_subcommand -f -a " +
                name + " -d '" + escaped(command->get_description(), "'\\", "\\") + "'\n";
        for (const CLI::Option* option : optionsOf(*command)) {
            text += fishLine(*option, " -n '__fish_seen_subcommand_from " + name + "'");
        }
    }
    return text;
}

}  // namespace host
