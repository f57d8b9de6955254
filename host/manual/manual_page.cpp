// SPDX-License-Identifier: Apache-2.0
#include <string>
#include <string_view>
#include <vector>

#include "host/commands/command_line.h"
#include "host/manual/manual.h"

namespace host {

namespace {

// `text` as it stands, in a source for man: there a backslash begins a request, a dash is a hyphen,
// and a point or an apostrophe begins a request at the beginning of a line.
std::string literal(std::string_view text) {
    std::string source;
    bool beginsLine = true;
    for (const char character : text) {
        if (beginsLine && (character == '.' || character == '\'')) {
            source += "\\&";
        }
        beginsLine = character == '\n';
        switch (character) {
            case '\\':
                source += "\\e";
                break;
            case '-':
                source += "\\-";
                break;
            case '\n':
                source += "\n.br\n";
                break;
            default:
                source += character;
        }
    }
    return source;
}

std::string bold(std::string_view text) {
    return "\\fB" + literal(text) + "\\fR";
}

std::string italic(std::string_view text) {
    return "\\fI" + literal(text) + "\\fR";
}

std::string paragraphOf(const DescribedOption& option) {
    std::string names;
    for (const std::string& name : option.names()) {
        names += (names.empty() ? "" : ", ") + bold(name);
    }
    if (option.takesValue()) {
        names += " " + italic(option.value);
    }
    return ".TP\n" + names + "\n" + literal(option.description) + "\n";
}

std::string sectionOf(const DescribedCommand& command) {
    std::string heading = ".SS " + literal(command.name) + " [OPTION...]";
    std::string paragraphs;
    for (const DescribedArgument& argument : command.arguments) {
        heading += " " + argument.name + (argument.isRepeated ? "..." : "");
        paragraphs += ".TP\n" + italic(argument.name) + "\n" + literal(argument.description) + "\n";
    }
    for (const DescribedOption& option : command.options) {
        if (!option.isHelp) {
            paragraphs += paragraphOf(option);
        }
    }
    return heading + "\n" + literal(command.description) + ".\n" + paragraphs;
}

}  // namespace

std::string manualPage(const DescribedProgram& program) {
    std::string options;
    for (const DescribedOption& option : program.options) {
        options += paragraphOf(option);
    }
    // Without a date: the same sources make the same page.
    std::string page = ".TH SERIALIZATION_HOST 1 \"\" \"" + program.version +
                       "\" \"User Commands\"\n"
                       ".SH NAME\n" +
                       literal(programName) +
                       " \\- open and save documents for a browser\\-based editor\n"
                       ".SH SYNOPSIS\n" +
                       bold(programName) + " [" + italic("OPTION") + "...] " + italic("COMMAND") +
                       " [" + italic("ARGUMENT") + "...]\n.SH DESCRIPTION\n" +
                       literal(program.description) +
                       "\n.SH OPTIONS\nThese may stand before and behind each command.\n" +
                       options + ".SH COMMANDS\n";
    for (const DescribedCommand& command : program.commands) {
        page += sectionOf(command);
    }
    return page + ".SH EXIT STATUS\n" + literal(exitStatuses) +
           "\n.SH SEE ALSO\n.BR editor\\-serialization (7),\n.BR nats\\-server (8)\n";
}

}  // namespace host
