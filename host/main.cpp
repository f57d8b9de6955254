// SPDX-License-Identifier: Apache-2.0
// serialization_host: loads the bundle and gives it a message bus.
#include <spdlog/logger.h>
#include <spdlog/sinks/stdout_color_sinks.h>
#include <spdlog/spdlog.h>

#include <unistd.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <filesystem>
#include <functional>
#include <iostream>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string>

#include "host/bus/bundle_location.h"
#include "host/commands/exit_status.h"
#include "host/commands/history_command.h"
#include "host/commands/read_command.h"
#include "host/commands/serve_command.h"
#include "host/commands/standard_streams.h"
#include "host/commands/stdio_command.h"
#include "host/commands/write_command.h"
#include "host/limits/freed_memory.h"
#include "host/limits/limiting_sink.h"
#include "host/limits/memory_limit.h"
#include "host/server/nats_configuration.h"
#include "platform/posix/file_descriptor.h"

namespace {

constexpr const char* programName = "serialization_host";

struct CommandLine {
    std::string logLevel = "warning";
    std::uint64_t memoryLimit = LIMIT_MEMORY ? host::defaultMemoryLimit() : 0;
    std::filesystem::path bundle;
    host::HistoryCommandOptions history;
    host::ReadOptions read;
    host::ServeOptions serve;
    host::StdioOptions stdio;
    host::WriteOptions write;
};

void declareTimeout(CLI::App& command, std::chrono::seconds& timeout) {
    command
        .add_option_function<unsigned>(
            "--timeout", [&timeout](unsigned seconds) { timeout = std::chrono::seconds(seconds); },
            "How long to wait for a response (default: " + std::to_string(timeout.count()) + ")")
        ->type_name("SECONDS")
        ->check(CLI::Range(1U, 1'000'000'000U));
}

void declareRead(CLI::App& command, host::ReadOptions& options) {
    command.add_option("FILE", options.files, "The files to read")->required();
    command
        .add_option("--content-type", options.contentType,
                    "The content type to ask for (default: text/xml for a document package, else "
                    "text/plain)")
        ->type_name("TYPE");
    declareTimeout(command, options.timeout);
}

// A check of an option's value, which says what `isValid` finds wrong.
CLI::Validator check(const std::string& type,
                     const std::function<std::string(std::string&)>& fault) {
    return CLI::Validator(fault, type);
}

std::string faultOfServerUrl(const std::string& url) {
    // Command lines can be seen by every user of the machine.
    return url.find('@') == std::string::npos
               ? ""
               : "a URL of --nats may hold no user and password; there are --nats-user and "
                 "--nats-password-file, --nats-token-file and --creds";
}

void declareOwnServer(CLI::App& command, host::NatsServerOptions& options, CLI::Option& others) {
    command
        .add_option("--port", options.port,
                    "The port of the host's own message server (default: any that is free)")
        ->excludes(&others);
    command
        .add_option("--websocket-port", options.webSocketPort,
                    "Its port for browsers (default: any that is free)")
        ->excludes(&others);
    command
        .add_option("--allow-origin", options.allowedOrigins,
                    "The origin of other web pages that may connect, such as http://localhost:3000")
        ->type_name("ORIGIN")
        ->allow_extra_args(false)
        ->excludes(&others)
        ->check(check("ORIGIN", [](const std::string& origin) {
            return host::isOrigin(origin) ? ""
                                          : "\"" + origin +
                                                "\" is no origin such as "
                                                "http://localhost:3000";
        }));
    command
        .add_option("--nats-server", options.program,
                    "The program of the server (default: nats-server, where programs are)")
        ->type_name("PATH")
        ->excludes(&others);
}

CLI::Option& declareOtherServers(CLI::App& command, host::OtherServers& options) {
    CLI::Option& servers =
        *command
             .add_option("--nats", options.urls,
                         "Message servers to work for, in place of one of the host's own")
             ->type_name("URL,...")
             ->delimiter(',')
             ->allow_extra_args(false)
             ->check(check("URL", faultOfServerUrl));
    const auto declareFile = [&](const std::string& name, std::filesystem::path& file,
                                 const std::string& description) {
        return command.add_option(name, file, description)
            ->type_name("FILE")
            ->check(CLI::ExistingFile)
            ->needs(&servers);
    };
    declareFile("--creds", options.credentialsFile, "The credentials to show them");
    declareFile("--nats-token-file", options.tokenFile, "Holds the token to show them");
    CLI::Option* const user =
        command.add_option("--nats-user", options.user, "The user to be there")
            ->type_name("NAME")
            ->needs(&servers);
    user->needs(
        declareFile("--nats-password-file", options.passwordFile, "Holds the password of that user")
            ->needs(user));
    declareFile("--tls-ca", options.caFile,
                "The authorities to trust, in PEM (default: the system's)");
    CLI::Option* const certificate =
        declareFile("--tls-cert", options.certificateFile, "The host's own certificate, in PEM");
    certificate->needs(
        declareFile("--tls-key", options.keyFile, "Its key, in PEM")->needs(certificate));
    command
        .add_option("--group", options.group,
                    "The group of workers that share the requests (default: " + options.group + ")")
        ->type_name("NAME")
        ->needs(&servers);
    return servers;
}

void declareWeb(CLI::App& command, host::WebOptions& options) {
    CLI::Option* const none = command.add_flag("!--no-web", options.isServed, "Serve no web page");
    command
        .add_option("--web", options.folder,
                    "The folder to serve to browsers (default: a page that reads documents; none "
                    "with --nats)")
        ->type_name("DIR")
        ->check(CLI::ExistingDirectory)
        ->excludes(none);
    command
        .add_option_function<std::string>(
            "--listen",
            [&options](const std::string& text) {
                try {
                    options.address = host::ListenAddress::parse(text);
                } catch (const std::invalid_argument& error) {
                    throw CLI::ValidationError("--listen", error.what());
                }
            },
            "Where browsers find it (default: 127.0.0.1:8080)")
        ->type_name("HOST:PORT")
        ->excludes(none);
    command
        .add_option("--web-connections", options.connectionsOfAddress,
                    "The most connections that one address may have to it (default: no limit of "
                    "its own, for all who come through one proxy share an address)")
        ->type_name("COUNT")
        ->excludes(none);
}

// The host's own server can let pages of one origin of each host in, the web page's included.
void requireDistinctHosts(const host::ServeOptions& options) {
    std::vector<std::string> origins = options.ownServer.allowedOrigins;
    if (options.web.isServed) {
        origins.push_back(options.web.address.origin());
    }
    if (const std::string host = host::commonHost(origins); !host.empty()) {
        throw CLI::ValidationError("--allow-origin",
                                   "only one origin of the host " + host +
                                       " can be let in, that of the web page included");
    }
}

// Options of the commands that save documents. `isOn` is what they do without.
void declareGuard(CLI::App& command, host::GuardOptions& options) {
    if (options.isOn) {
        command.add_flag("!--no-safe-saves", options.isOn,
                         "Have texts written in place, as the bundle does by itself");
    } else {
        command.add_flag("--safe-saves", options.isOn,
                         "Have no fault of the machine make a save lose a text");
    }
    command
        .add_option("--history", options.folder,
                    "Where earlier versions of documents are kept (default: the user's folder for "
                    "states)")
        ->type_name("DIR");
    command
        .add_option("--keep", options.versions,
                    "The earlier versions to keep of each document (default: " +
                        std::to_string(options.versions) + ")")
        ->type_name("N")
        ->check(CLI::Range(1U, 1'000'000U));
    command.add_flag("!--no-history", options.keepsVersions, "Keep no earlier versions");
}

void declareServe(CLI::App& command, host::ServeOptions& options) {
    command
        .add_option("--root", options.roots,
                    "A folder that clients may use; may be given several times (default: all)")
        ->type_name("DIR")
        ->allow_extra_args(false)
        ->check(CLI::ExistingDirectory);
    command.add_flag("!--no-confinement", options.isConfined,
                     "Go without the kernel's help to keep clients to the folders of --root");
    declareGuard(command, options.guard);
    declareWeb(command, options.web);
    declareOwnServer(command, options.ownServer,
                     declareOtherServers(command, options.otherServers));
    command.final_callback([&command, &options] {
        // A worker among others need not be where browsers go.
        if (!options.otherServers.urls.empty() && command.count("--web") == 0 &&
            command.count("--listen") == 0) {
            options.web.isServed = false;
        }
        requireDistinctHosts(options);
    });
}

void declareStdio(CLI::App& command, host::StdioOptions& options) {
    command
        .add_option(
            "--max-message", options.largestMessage,
            "The largest message to take, in bytes or with a unit such as MB (default: 1 GB)")
        ->type_name("SIZE")
        ->transform(CLI::AsSizeValue(false));
    declareGuard(command, options.guard);
}

void declareWrite(CLI::App& command, host::WriteOptions& options) {
    command.add_option("FILE", options.file, "The file to write")->required();
    command
        .add_option("--content-type", options.contentType,
                    "The content type of the request (default: text/xml for the JSON of a document "
                    "package, as read prints it, else text/plain)")
        ->type_name("TYPE");
    command
        .add_option("--encoding", options.encoding,
                    "The charset of a text, as it comes in and as it is stored (default: " +
                        options.encoding + ")")
        ->type_name("CHARSET");
    declareGuard(command, options.guard);
    declareTimeout(command, options.timeout);
}

void declareHistory(CLI::App& command, host::HistoryCommandOptions& options) {
    command.add_option("FILE", options.file, "The document")->required();
    command
        .add_option("--history", options.guard.folder,
                    "Where the versions are (default: the user's folder for states)")
        ->type_name("DIR");
    CLI::Option* const shown =
        command.add_option("--show", options.shown, "Print a version, as read does")
            ->type_name("N")
            ->check(CLI::PositiveNumber);
    command.add_option("--restore", options.restored, "Save a version as the newest")
        ->type_name("N")
        ->check(CLI::PositiveNumber)
        ->excludes(shown);
    command
        .add_option("--content-type", options.contentType,
                    "The content type to show it as (default: by its content)")
        ->type_name("TYPE");
}

// Declares the options and commands of `app`, which a parse puts into `line`.
void declare(CLI::App& app, CommandLine& line) {
    app.set_version_flag("--version", std::string(programName) + " " + PROGRAM_VERSION);
    app.add_option("--bundle", line.bundle,
                   "The bundle to load (default: the one that belongs to the program)")
        ->type_name("PATH");
    app.add_option("--log-level", line.logLevel,
                   "What to tell on standard error (default: " + line.logLevel + ")")
        ->type_name("LEVEL")
        ->check(CLI::IsMember({"trace", "debug", "info", "warning", "error", "critical", "off"}));
    app.add_option("--memory-limit", line.memoryLimit,
                   "The most memory to take, in bytes or with a unit such as GB; what needs more "
                   "fails (default: three quarters of the machine's; 0: no limit)")
        ->type_name("SIZE")
        ->transform(CLI::AsSizeValue(false));
    app.require_subcommand(1);
    app.fallthrough();
    declareRead(*app.add_subcommand("read", "Read files and print the response for each on a line"),
                line.read);
    declareHistory(*app.add_subcommand("history",
                                       "List earlier versions of a document, or show or "
                                       "restore one"),
                   line.history);
    declareServe(*app.add_subcommand("serve", "Serve browsers and other programs, over NATS"),
                 line.serve);
    declareStdio(*app.add_subcommand("stdio", "Carry framed messages on standard input and output"),
                 line.stdio);
    declareWrite(*app.add_subcommand(
                     "write", "Write standard input to a file and print the answer, true or false"),
                 line.write);
}

// The lines that each logger may log of each level in that time. It is more than a person reads,
// and not so much that whoever sends wrong messages without end can fill the disk.
constexpr std::size_t mostLogLines = 100;
constexpr std::chrono::seconds logPeriod{10};

void setUpLogging(const std::string& level) {
    const auto sink = std::make_shared<host::LimitingSink>(
        std::make_shared<spdlog::sinks::stderr_color_sink_mt>(), mostLogLines, logPeriod);
    spdlog::set_default_logger(std::make_shared<spdlog::logger>(programName, sink));
    // The one that the messaging library takes.
    spdlog::register_logger(std::make_shared<spdlog::logger>("messaging", sink));
    spdlog::set_pattern("%^%n: %l:%$ %v");
    spdlog::set_level(spdlog::level::from_str(level));
}

int run(CLI::App& app, CommandLine& line, int output) {
    const std::filesystem::path bundle = line.bundle.empty() ? host::findBundle() : line.bundle;
    if (app.got_subcommand("read")) {
        line.read.bundle = bundle;
        return host::runRead(line.read, output);
    }
    if (app.got_subcommand("history")) {
        line.history.bundle = bundle;
        return host::runHistory(line.history, output);
    }
    if (app.got_subcommand("serve")) {
        line.serve.bundle = bundle;
        return host::runServe(line.serve, output);
    }
    if (app.got_subcommand("write")) {
        line.write.bundle = bundle;
        return host::runWrite(line.write, STDIN_FILENO, output);
    }
    line.stdio.bundle = bundle;
    return host::runStdio(line.stdio, STDIN_FILENO, output);
}

// Tells what ended the parse early: help and version on `output`, an error on standard error.
int explain(const CLI::App& app, const CLI::ParseError& error, int output) {
    std::ostringstream help;
    std::ostringstream complaint;
    const bool isHelp = app.exit(error, help, complaint) == 0;
    if (!isHelp) {
        std::cerr << programName << ": " << complaint.str();
        return host::exitWrongUsage;
    }
    host::writeAll(output, {help.str()});
    return host::exitDone;
}

int runCommandLine(int argc, char** argv) {
    host::openMissingStandardStreams();
    const platform::FileDescriptor output = host::divertStandardOutput();
    CLI::App app("Loads the document-serialization bundle and gives it a message bus.",
                 programName);
    CommandLine line;
    declare(app, line);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        return explain(app, error, output.get());
    }
    setUpLogging(line.logLevel);
    host::keepFreedMemory();
    if (line.memoryLimit != 0) {
        host::limitMemory(line.memoryLimit);
    }
    const int status = run(app, line, output.get());
    spdlog::default_logger()->flush();  // It may have lines to tell of that it left out.
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    // A reader that goes away shall be an error of the write, not the end of the process.
    std::signal(SIGPIPE, SIG_IGN);
    // The same for a file that grows past the process's limit.
    std::signal(SIGXFSZ, SIG_IGN);
    try {
        return runCommandLine(argc, argv);
    } catch (const std::exception& error) {
        std::cerr << programName << ": " << error.what() << '\n';
        return host::exitRequestFailed;
    }
}
