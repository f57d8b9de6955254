// SPDX-License-Identifier: Apache-2.0
// The program's command line: the one description of its commands and options, from which the
// parser, the texts of --help, the hints at mistakes and the manual (host/manual/) are made.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "host/commands/history_command.h"
#include "host/commands/read_command.h"
#include "host/commands/serve_command.h"
#include "host/commands/stdio_command.h"
#include "host/commands/write_command.h"

// The library's header takes a compiler seconds; only what uses the parser includes it.
namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace host {

inline constexpr const char* programName = "serialization_host";

/// What the program's exit statuses mean.
inline constexpr const char* exitStatuses =
    "0 when all is done, 1 when a request failed, 2 for wrong options or framing.";

/// What a command line says.
struct CommandLine {
    std::string logLevel = "warning";
    std::uint64_t memoryLimit = 0;  ///< In bytes; 0: none.
    std::filesystem::path bundle;   ///< Empty: the one that belongs to the program.
    HistoryCommandOptions history;
    ReadOptions read;
    ServeOptions serve;
    StdioOptions stdio;
    WriteOptions write;
};

/// Declares the program's commands and options in `app`, which fills in `line` when it parses; the
/// values that `line` has then are the defaults. Both must live until the parsing is done.
void describe(CLI::App& app, CommandLine& line);

/// Lets `app` parse `arguments`, those of the program without its own name. One that looks like an
/// option, but is none and names a file, is taken for that file, since a pattern of the shell may
/// expand to such names; so is everything after "--". Throws CLI::ParseError.
void parse(CLI::App& app, std::vector<std::string> arguments);

/// The message, in whole lines, for a command line that `app` could not parse.
std::string complaint(const CLI::App& app, const CLI::ParseError& error);

}  // namespace host
