// SPDX-License-Identifier: Apache-2.0
#include <string_view>

#include "host/commands/command_line.h"
#include "host/manual/described_options.h"
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

std::string paragraphOf(const CLI::Option& option) {
    std::string names;
    for (const std::string& name : namesOf(option)) {
        names += (names.empty() ? "" : ", ") + bold(name);
    }
    if (takesValue(option)) {
        names += " " + italic(option.get_type_name());
    }
    return ".TP\n" + names + "\n" + literal(option.get_description()) + "\n";
}

// The options of a command, all but those that every one has.
std::string paragraphsOf(const CLI::App& app) {
    std::string text;
    for (const CLI::Option* option : optionsOf(app)) {
        if (app.get_parent() == nullptr || option != app.get_help_ptr()) {
            text += paragraphOf(*option);
        }
    }
    return text;
}

std::string sectionOf(const CLI::App& command) {
    std::string heading = ".SS " + literal(command.get_name()) + " [OPTION...]";
    std::string arguments;
    for (const CLI::Option* argument : argumentsOf(command)) {
        heading += " " + argument->get_name(true) + (argument->get_expected_max() > 1 ? "..." : "");
        arguments += ".TP\n" + italic(argument->get_name(true)) + "\n" +
                     literal(argument->get_description()) + "\n";
    }
    return heading + "\n" + literal(command.get_description()) + ".\n" + arguments +
           paragraphsOf(command);
}

}  // namespace

std::string manualPage(const CLI::App& app) {
    // Without a date: the same sources make the same page.
    std::string page = ".TH SERIALIZATION_HOST 1 \"\" \"" + app.version() +
                       "\" \"User Commands\"\n"
                       ".SH NAME\n" +
                       literal(programName) +
                       " \\- open and save documents for a browser\\-based editor\n"
                       ".SH SYNOPSIS\n" +
                       bold(programName) + " [" + italic("OPTION") + "...] " + italic("COMMAND") +
                       " [" + italic("ARGUMENT") + "...]\n.SH DESCRIPTION\n" +
                       literal(app.get_description()) +
                       "\n.SH OPTIONS\nThese may stand before and behind each command.\n" +
                       paragraphsOf(app) + ".SH COMMANDS\n";
    for (const CLI::App* command : commandsOf(app)) {
        page += sectionOf(*command);
    }
    return page + ".SH EXIT STATUS\n" + literal(exitStatuses) +
           "\n.SH SEE ALSO\n.BR editor\\-serialization (7),\n.BR nats\\-server (8)\n";
}

}  // namespace host
