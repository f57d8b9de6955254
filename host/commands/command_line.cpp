// SPDX-License-Identifier: Apache-2.0
#include "host/commands/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "host/server/nats_configuration.h"

namespace host {

namespace {

// Prints options with the names of their values and nothing else, in lines that fit a terminal.
class HelpFormatter final : public CLI::Formatter {
public:
    std::string make_option_opts(const CLI::Option* option) const override {
        return option->get_positional() || option->get_type_size() == 0
                   ? ""
                   : " " + option->get_type_name();
    }

    std::string make_option_desc(const CLI::Option* option) const override {
        return wrapped(option->get_description());
    }

    std::string make_subcommand(const CLI::App* command) const override {
        std::ostringstream line;
        CLI::detail::format_help(line, command->get_name(), wrapped(command->get_description()),
                                 get_column_width());
        return line.str();
    }

private:
    std::string wrapped(const std::string& description) const {
        constexpr std::size_t width = 79;
        std::istringstream words(description);
        std::string text;
        std::size_t room = width - get_column_width();
        for (std::string word; words >> word; room -= word.size() + 1) {
            if (word.size() + 1 > room) {
                text += '\n';
                room = width - get_column_width();
            } else if (!text.empty()) {
                text += ' ';
            }
            text += word;
        }
        return text;
    }
};

// `validator` without its text in the help, where the description says what is valid.
CLI::Validator withoutHelpText(CLI::Validator validator) {
    return validator.description("");
}

// A check of an option's value by `fault`, which says what is wrong with it; empty if nothing is.
CLI::Validator check(const std::function<std::string(std::string&)>& fault) {
    return CLI::Validator(fault, "");
}

// The number of bytes that `text` means, such as "65536" or "500 MB"; nothing where it is no size,
// or one too large for the type.
std::optional<std::uint64_t> bytesOf(const std::string& text) {
    static const std::regex form("([0-9]+) *(?:([kmgtpe])i?)?b?", std::regex::icase);
    std::smatch match;
    std::uint64_t number = 0;
    if (!std::regex_match(text, match, form) ||
        std::from_chars(&*match[1].first, &*match[1].first + match.length(1), number).ec !=
            std::errc()) {
        return std::nullopt;
    }
    std::size_t shift = 0;
    if (match.length(2) != 0) {
        constexpr std::string_view units = "kmgtpeKMGTPE";
        shift = 10 * (1 + units.find(*match[2].first) % (units.size() / 2));
    }
    const bool fits = number <= std::numeric_limits<std::uint64_t>::max() >> shift;
    return fits ? std::optional(number << shift) : std::nullopt;
}

// An option `name` for a number of bytes. `fault` says what is wrong with a number; it is empty
// for a good one.
void declareSize(CLI::App& command, const std::string& name, std::uint64_t& bytes,
                 const std::string& description,
                 const std::function<std::string(std::uint64_t)>& fault) {
    command
        .add_option_function<std::string>(
            name,
            [&bytes, name, fault](const std::string& text) {
                const std::optional<std::uint64_t> given = bytesOf(text);
                if (!given) {
                    throw CLI::ValidationError(name, "\"" + text + "\" is no size such as 500MB");
                }
                if (const std::string reason = fault(*given); !reason.empty()) {
                    throw CLI::ValidationError(name, text + " is too little: " + reason);
                }
                bytes = *given;
            },
            description)
        ->type_name("SIZE");
}

// An option `name` that makes `isOn` false.
CLI::Option* declareNegation(CLI::App& command, const std::string& name, bool& isOn,
                             const std::string& description) {
    return command.add_flag_callback(
        name, [&isOn] { isOn = false; }, description);
}

void declareTimeout(CLI::App& command, std::chrono::seconds& timeout) {
    command
        .add_option_function<unsigned>(
            "--timeout", [&timeout](unsigned seconds) { timeout = std::chrono::seconds(seconds); },
            "How long to wait for an answer (default: " + std::to_string(timeout.count()) + ")")
        ->type_name("SECONDS")
        ->check(withoutHelpText(CLI::Range(1U, 1'000'000'000U)));
}

void declareContentType(CLI::App& command, std::string& contentType, const std::string& usual) {
    command
        .add_option("--content-type", contentType,
                    "The content type of the request: text/xml for a document package, anything "
                    "else for a text (default: " +
                        usual + ")")
        ->type_name("TYPE");
}

void declareRead(CLI::App& command, ReadOptions& options) {
    command.add_option("FILE", options.files, "The files to read; - is the standard input")
        ->required();
    declareContentType(command, options.contentType, "by what the file is");
    CLI::Option* const utf8 = command.add_flag_callback(
        "--utf8", [&options] { options.form = ReadOptions::Form::utf8; },
        "Print each response as valid UTF-8, with \"filePath\" and, of a text, \"encoding\", the "
        "file's charset, added; \"brokenParts\" names the parts of a document whose bytes are not "
        "UTF-8 and so printed as others");
    command
        .add_flag_callback(
            "--text", [&options] { options.form = ReadOptions::Form::text; },
            "Print the texts themselves, in UTF-8 and without byte-order marks")
        ->excludes(utf8);
    declareTimeout(command, options.timeout);
}

std::string faultOfServerUrl(const std::string& url) {
    if (url.find('@') != std::string::npos) {
        // Command lines can be seen by every user of the machine.
        return "a URL of --nats may hold no user and password; there are --nats-user and "
               "--nats-password-file, --nats-token-file and --creds";
    }
    static const std::regex form(
        R"((nats|tls)://(\[[0-9A-Fa-f:.]+\]|[^/:\[\]\s]+)(:[0-9]{1,5})?/?)");
    return std::regex_match(url, form)
               ? ""
               : "\"" + url + "\" is not the address of a server, such as nats://127.0.0.1:4222";
}

void declareOwnServer(CLI::App& command, NatsServerOptions& options, CLI::Option& others) {
    command
        .add_option("--port", options.port,
                    "The port of the host's own message server (default: any that is free)")
        ->type_name("PORT")
        ->excludes(&others);
    command
        .add_option("--websocket-port", options.webSocketPort,
                    "Its port for browsers (default: any that is free)")
        ->type_name("PORT")
        ->excludes(&others);
    command
        .add_option(
            "--allow-origin", options.allowedOrigins,
            "The origin of another web page that may connect, such as http://localhost:3000; "
            "may be given several times")
        ->type_name("ORIGIN")
        ->allow_extra_args(false)
        ->excludes(&others)
        ->check(check([](const std::string& origin) {
            return isOrigin(origin) ? ""
                                    : "\"" + origin +
                                          "\" is not an origin such as "
                                          "http://localhost:3000";
        }));
    command
        .add_option("--nats-server", options.program,
                    "The program of the server (default: nats-server, from the usual folders)")
        ->type_name("PATH")
        ->excludes(&others);
}

CLI::Option& declareOtherServers(CLI::App& command, OtherServers& options) {
    CLI::Option& servers =
        *command
             .add_option("--nats", options.urls,
                         "Message servers to use in place of one of the host's own")
             ->type_name("URL,...")
             ->delimiter(',')
             ->allow_extra_args(false)
             ->check(check(faultOfServerUrl));
    const auto declareFile = [&](const std::string& name, std::filesystem::path& file,
                                 const std::string& description) {
        return command.add_option(name, file, description)
            ->type_name("FILE")
            ->check(withoutHelpText(CLI::ExistingFile))
            ->needs(&servers);
    };
    declareFile("--creds", options.credentialsFile, "The credentials to log in with");
    declareFile("--nats-token-file", options.tokenFile, "The token to log in with");
    CLI::Option* const user =
        command.add_option("--nats-user", options.user, "The user name to log in with")
            ->type_name("NAME")
            ->needs(&servers);
    user->needs(declareFile("--nats-password-file", options.passwordFile,
                            "The password of that user, on its first line")
                    ->needs(user));
    declareFile("--tls-ca", options.caFile,
                "The authorities to trust, in PEM (default: the system's)");
    CLI::Option* const certificate =
        declareFile("--tls-cert", options.certificateFile, "The host's own certificate, in PEM");
    certificate->needs(
        declareFile("--tls-key", options.keyFile, "Its key, in PEM")->needs(certificate));
    command
        .add_option("--group", options.group,
                    "The group of workers of the servers of --nats that share the requests "
                    "(default: " +
                        options.group + ")")
        ->type_name("NAME")
        ->take_last();
    return servers;
}

void declareWeb(CLI::App& command, WebOptions& options) {
    CLI::Option* const none =
        declareNegation(command, "--no-web", options.isServed, "Serve no web page");
    command
        .add_option(
            "--web", options.folder,
            "The folder to serve to browsers (default: the editor's page; with --nats none, "
            "unless --listen is given)")
        ->type_name("DIR")
        ->check(withoutHelpText(CLI::ExistingDirectory))
        ->excludes(none);
    command
        .add_option_function<std::string>(
            "--listen",
            [&options](const std::string& text) {
                try {
                    options.address = ListenAddress::parse(text);
                } catch (const std::invalid_argument& error) {
                    throw CLI::ValidationError("--listen", error.what());
                }
            },
            "The address of the web page (default: 127.0.0.1:8080)")
        ->type_name("HOST:PORT")
        ->excludes(none);
    command
        .add_option("--web-connections", options.connectionsOfAddress,
                    "The most connections to the page from one address (default: any number, since "
                    "all who come through one proxy share an address)")
        ->type_name("COUNT")
        ->excludes(none);
}

void declareMetrics(CLI::App& command, ServeOptions& options) {
    command
        .add_option_function<std::string>(
            "--metrics",
            [&options](const std::string& text) {
                try {
                    options.metrics = ListenAddress::parse(text);
                } catch (const std::invalid_argument& error) {
                    throw CLI::ValidationError("--metrics", error.what());
                }
            },
            "The address of /metrics, in Prometheus' format, and /healthz, for programs that watch "
            "the host (default: none)")
        ->type_name("HOST:PORT");
}

// The host's own server can let pages of one origin of each host in, the web page's included.
void requireDistinctHosts(const ServeOptions& options) {
    std::vector<std::string> origins = options.ownServer.allowedOrigins;
    if (options.web.isServed) {
        origins.push_back(options.web.address.origin());
    }
    if (const std::string host = commonHost(origins); !host.empty()) {
        throw CLI::ValidationError("--allow-origin",
                                   "only one origin of the host " + host +
                                       " can be let in, that of the web page included");
    }
}

// Options of the commands that save documents. `isOn` is what they do without.
void declareGuard(CLI::App& command, GuardOptions& options) {
    if (options.isOn) {
        declareNegation(command, "--no-safe-saves", options.isOn,
                        "Write texts in place, as the bundle does by itself");
    } else {
        command.add_flag("--safe-saves", options.isOn,
                         "Save texts so that a failure of the machine loses none");
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
        ->check(withoutHelpText(CLI::Range(1U, 1'000'000U)));
    declareNegation(command, "--no-history", options.keepsVersions, "Keep no earlier versions");
}

void declareServe(CLI::App& command, ServeOptions& options) {
    command
        .add_option("--root", options.roots,
                    "A folder that clients may use; may be given several times (default: all)")
        ->type_name("DIR")
        ->allow_extra_args(false)
        ->check(withoutHelpText(CLI::ExistingDirectory));
    declareNegation(command, "--no-confinement", options.isConfined,
                    "Do not have the kernel keep clients to the folders of --root");
    declareGuard(command, options.guard);
    command
        .add_option("--max-message", options.largestMessage,
                    "The longest request or answer, in bytes or with a unit such as MB (default: "
                    "1 GB, and at most a tenth of --memory-limit)")
        ->type_name("SIZE")
        ->transform(withoutHelpText(CLI::AsSizeValue(false)));
    declareWeb(command, options.web);
    declareMetrics(command, options);
    declareOwnServer(command, options.ownServer,
                     declareOtherServers(command, options.otherServers));
    command.final_callback([&command, &options] {
        // A worker among others need not serve browsers.
        if (!options.otherServers.urls.empty() && command.count("--web") == 0 &&
            command.count("--listen") == 0) {
            options.web.isServed = false;
        }
        requireDistinctHosts(options);
    });
}

void declareStdio(CLI::App& command, StdioOptions& options) {
    declareSize(command, "--max-message", options.largestMessage,
                "The largest message to take, in bytes or with a unit such as MB (default: 1 GB)",
                [](std::uint64_t bytes) { return bytes == 0 ? "no message is so short" : ""; });
    declareGuard(command, options.guard);
}

void declareWrite(CLI::App& command, WriteOptions& options) {
    command.add_option("FILE", options.file, "The file to write")
        ->required()
        ->check(check([](const std::string& file) {
            return file == "-" ? "\"-\" cannot be written to; a file of that name is ./-" : "";
        }));
    declareContentType(command, options.contentType,
                       "by whether the input is a package's JSON, as read prints it");
    command
        .add_option("--encoding", options.encoding,
                    "The charset in which a text is stored, and without --text comes in (default: "
                    "UTF-8; with --text that of the file, if there is one)")
        ->type_name("CHARSET");
    command.add_flag("--text", options.isUtf8Text,
                     "Read the input as a text in UTF-8, as read --text prints it");
    declareGuard(command, options.guard);
    declareTimeout(command, options.timeout);
    command.final_callback([&options] {
        if (options.isUtf8Text && options.contentType == packageContentType) {
            throw CLI::ExcludesError("--text", "--content-type " + options.contentType);
        }
    });
}

void declareHistory(CLI::App& command, HistoryCommandOptions& options) {
    command.add_option("FILE", options.file, "The document")->required();
    command
        .add_option("--history", options.guard.folder,
                    "Where the versions are (default: the user's folder for states)")
        ->type_name("DIR");
    CLI::Option* const shown =
        command.add_option("--show", options.shown, "Print a version, as read does")
            ->type_name("N")
            ->check(withoutHelpText(CLI::PositiveNumber));
    command.add_option("--restore", options.restored, "Save a version as the newest")
        ->type_name("N")
        ->check(withoutHelpText(CLI::PositiveNumber))
        ->excludes(shown);
    command
        .add_option("--content-type", options.contentType,
                    "The content type to show it as (default: by its content)")
        ->type_name("TYPE");
}

bool isOption(const CLI::App& app, const std::string& argument) {
    const std::string name = argument.substr(0, argument.find('='));
    const std::vector<const CLI::App*> commands =
        app.get_subcommands([](const CLI::App*) { return true; });
    return app.get_option_no_throw(name) != nullptr ||
           std::any_of(commands.begin(), commands.end(), [&name](const CLI::App* command) {
               return command->get_option_no_throw(name) != nullptr;
           });
}

}  // namespace

void describe(CLI::App& app, CommandLine& line) {
    app.formatter(std::make_shared<HelpFormatter>());
    app.get_formatter()->label("SUBCOMMAND", "COMMAND");
    app.get_formatter()->label("Positionals", "Arguments");
    app.name(programName);
    app.description(
        "Reads and writes documents through the bundle and serves it to other programs.");
    app.set_version_flag("--version", std::string(programName) + " " + PROGRAM_VERSION,
                         "Print the version and exit");
    app.set_help_flag("-h,--help", "Print this help and exit");
    app.add_option("--bundle", line.bundle,
                   "The bundle to load (default: the one that belongs to the program)")
        ->type_name("PATH");
    app.add_option("--log-level", line.logLevel,
                   "The least serious messages to show on standard error: trace, debug, info, "
                   "warning, error, critical or off (default: " +
                       line.logLevel + ")")
        ->type_name("LEVEL")
        ->check(withoutHelpText(
            CLI::IsMember({"trace", "debug", "info", "warning", "error", "critical", "off"})));
    declareSize(
        app, "--memory-limit", line.memoryLimit,
        "The most memory to take, in bytes or with a unit such as GB; what needs more fails "
        "(default: three quarters of the machine's; 0: no limit)",
        [](std::uint64_t bytes) {
            // Less is not enough to start the threads and the bundle.
            constexpr std::uint64_t least = 64ULL << 20U;
            return bytes == 0 || bytes >= least ? "" : "the program itself takes some 64 MB";
        });
    app.require_subcommand(1);
    app.fallthrough();
    declareRead(*app.add_subcommand("read", "Read files and print the response for each on a line"),
                line.read);
    declareHistory(*app.add_subcommand("history",
                                       "List (with times in UTC), show or restore earlier versions "
                                       "of a document"),
                   line.history);
    declareServe(*app.add_subcommand("serve", "Serve browsers and other programs, over NATS"),
                 line.serve);
    declareStdio(*app.add_subcommand("stdio", "Carry framed messages on standard input and output"),
                 line.stdio);
    declareWrite(*app.add_subcommand(
                     "write", "Write standard input to a file and print the answer, true or false"),
                 line.write);
    for (CLI::App* command : app.get_subcommands({})) {
        command->group("Commands");
    }
    app.footer(std::string("Exit status:\n") + exitStatuses +
               "\n\nCOMMAND --help lists the options of a command.");
}

void parse(CLI::App& app, std::vector<std::string> arguments) {
    const auto dashes = std::find(arguments.begin(), arguments.end(), "--");
    for (auto argument = arguments.begin(); argument != arguments.end(); ++argument) {
        std::error_code isNone;
        const bool looksLikeOption = argument->size() > 1 && argument->front() == '-';
        const bool isFile = argument > dashes || (!isOption(app, *argument) &&
                                                  std::filesystem::exists(*argument, isNone));
        if (looksLikeOption && argument != dashes && isFile) {
            argument->insert(0, "./");
        }
    }
    if (dashes != arguments.end()) {
        arguments.erase(dashes);  // Now that nothing after it looks like an option.
    }
    std::reverse(arguments.begin(), arguments.end());  // as the parser takes them
    app.parse(std::move(arguments));
}

}  // namespace host
