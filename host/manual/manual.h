// SPDX-License-Identifier: Apache-2.0
// The program's manual page and its completions for shells, made from the description of its
// command line (host/commands/command_line.h).
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace host {

/// The page serialization_host(1) for `app`, the program's described command line, in the macros of
/// man(7).
std::string manualPage(const CLI::App& app);

/// What bash sources to complete the program's commands, options and files.
std::string bashCompletion(const CLI::App& app);

/// The same for zsh: an autoloaded function.
std::string zshCompletion(const CLI::App& app);

/// The same for fish.
std::string fishCompletion(const CLI::App& app);

}  // namespace host
