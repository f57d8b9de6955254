// SPDX-License-Identifier: Apache-2.0
// The program's manual page and its completions for shells, made from the description of its
// command line.
#pragma once

#include <string>

#include "host/manual/described_program.h"

namespace host {

/// The page serialization_host(1), in the macros of man(7).
std::string manualPage(const DescribedProgram& program);

/// What bash sources to complete the program's commands, options and files.
std::string bashCompletion(const DescribedProgram& program);

/// The same for zsh: an autoloaded function.
std::string zshCompletion(const DescribedProgram& program);

/// The same for fish.
std::string fishCompletion(const DescribedProgram& program);

}  // namespace host
