// SPDX-License-Identifier: Apache-2.0
// What is wrong with a command line, and what was probably meant.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstddef>
#include <numeric>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/commands/command_line.h"
#include "host/limits/limiting_sink.h"

namespace host {

namespace {

// How many characters have to be inserted, removed or replaced to turn `from` into `to`.
std::size_t editDistance(std::string_view from, std::string_view to) {
    // The distances of the part of `from` that was handled so far from each prefix of `to`.
    std::vector<std::size_t> row(to.size() + 1);
    std::iota(row.begin(), row.end(), std::size_t{0});
    for (std::size_t i = 0; i < from.size(); ++i) {
        std::size_t diagonal = std::exchange(row[0], i + 1);
        for (std::size_t j = 0; j < to.size(); ++j) {
            const std::size_t replaced = diagonal + (from[i] == to[j] ? 0 : 1);
            diagonal = row[j + 1];
            row[j + 1] = std::min({replaced, diagonal + 1, row[j] + 1});
        }
    }
    return row.back();
}

// The one of `names` that `word` was probably meant to be.
std::optional<std::string> nearest(const std::string& word, const std::vector<std::string>& names) {
    const auto distance = [&word](const std::string& name) { return editDistance(word, name); };
    const auto best = std::min_element(
        names.begin(), names.end(),
        [&](const auto& one, const auto& other) { return distance(one) < distance(other); });
    const bool isNear = best != names.end() && distance(*best) <= word.size() / 2;
    return isNear ? std::optional(*best) : std::nullopt;
}

std::vector<std::string> optionsOf(const CLI::App& app) {
    std::vector<std::string> names;
    for (const CLI::Option* option : app.get_options()) {
        for (const std::string& name : option->get_lnames()) {
            names.push_back("--" + name);
        }
    }
    return names;
}

std::string question(const std::optional<std::string>& name) {
    return name ? "; did you mean \"" + *name + "\"?" : "";
}

// What is wrong with the word that `app` did not understand.
std::string unknown(const CLI::App& app, const std::string& word) {
    const std::vector<CLI::App*> commands = app.get_subcommands();
    if (word.starts_with("-")) {
        std::vector<std::string> names = optionsOf(app);
        for (const CLI::App* command : commands) {
            const std::vector<std::string> more = optionsOf(*command);
            names.insert(names.end(), more.begin(), more.end());
        }
        const std::string name = word.substr(0, word.find('='));
        return "there is no option \"" + name + "\"" + question(nearest(name, names));
    }
    if (commands.empty()) {
        std::vector<std::string> names;
        for (const CLI::App* command : app.get_subcommands({})) {
            names.push_back(command->get_name());
        }
        return "there is no command \"" + word + "\"" + question(nearest(word, names));
    }
    return "the argument \"" + word + "\" is one too many";
}

}  // namespace

std::string complaint(const CLI::App& app, const CLI::ParseError& error) {
    const std::vector<std::string> notUnderstood = app.remaining(true);
    std::string text = error.what();
    if (!notUnderstood.empty()) {
        text = unknown(app, notUnderstood.front());
    } else if (app.get_subcommands().empty() && dynamic_cast<const CLI::RequiredError*>(&error)) {
        text = "a command is missing";
    }
    return std::string(programName) + ": " + asLine(text) +
           "\nRun with --help for more information.\n";
}

}  // namespace host
