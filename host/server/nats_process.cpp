// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_process.h"

#include <poll.h>
#include <signal.h>
#include <spdlog/spdlog.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <cstddef>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <sstream>
#include <stdexcept>
#include <system_error>
#include <vector>

#include "host/limits/memory_limit.h"
#include "host/standard_streams.h"
#include "json/parser.h"
#include "json/value.h"

namespace host {

namespace {

// How the server, a Go program, collects garbage. In pieces of a MB each, a document has it collect
// every few of them: with GOGC at 400 rather than 100, it takes half to three quarters of the
// processor's time for one of 60 MB. Above GOMEMLIMIT it collects rather than grows: two thirds of
// the memory that the host leaves free by default.
std::vector<std::string> garbageCollection() {
    return {"GOGC=400", "GOMEMLIMIT=" + std::to_string(defaultMemoryLimit() / 9 * 2)};
}

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// How long the server may take to exit after the signal.
constexpr milliseconds longestStop{5'000};

// How often to check for another event while the server's output is read.
constexpr milliseconds eventInterval{10};

// Where Debian has the program, which is not among the folders of most users' PATH.
constexpr const char* systemFolders = ":/usr/local/sbin:/usr/sbin:/sbin";

bool isProgram(const std::filesystem::path& file) {
    std::error_code ignored;
    return std::filesystem::is_regular_file(file, ignored) && ::access(file.c_str(), X_OK) == 0;
}

bool isReadable(int fd, milliseconds timeout) {
    pollfd waited{fd, POLLIN, 0};
    return ::poll(&waited, 1, static_cast<int>(timeout.count())) > 0;
}

std::vector<std::filesystem::path> portsFilesIn(const std::filesystem::path& folder) {
    std::vector<std::filesystem::path> files;
    for (const auto& entry : std::filesystem::directory_iterator(folder)) {
        if (entry.path().extension() == ".ports") {
            files.push_back(entry.path());
        }
    }
    return files;
}

// Removes what killed servers have left, so that it is not mistaken for what the next one writes.
std::filesystem::path withoutPortsFiles(std::filesystem::path folder) {
    for (const std::filesystem::path& file : portsFilesIn(folder)) {
        std::filesystem::remove(file);
    }
    return folder;
}

// The port of the first URL of `urls`, such as ["nats://127.0.0.1:4222"]; 0: there is none.
std::uint16_t portIn(const json::Value& urls) {
    if (!urls.is<json::Array>() || urls.get<json::Array>().empty() ||
        !urls.get<json::Array>().front().is<std::string>()) {
        return 0;
    }
    const std::string& url = urls.get<json::Array>().front().get<std::string>();
    const char* const end = url.data() + url.size();
    std::uint16_t port = 0;
    const auto [parsed, error] = std::from_chars(url.data() + url.rfind(':') + 1, end, port);
    return error == std::errc() && parsed == end ? port : std::uint16_t{0};
}

}  // namespace

std::filesystem::path findNatsServer(const std::filesystem::path& program) {
    if (!program.empty()) {
        if (!isProgram(program)) {
            throw std::runtime_error("there is no program " + program.string() +
                                     "; the Debian package nats-server has one");
        }
        return program;
    }
    const char* path = std::getenv("PATH");
    std::istringstream folders((path == nullptr ? "" : path) + std::string(systemFolders));
    for (std::string folder; std::getline(folders, folder, ':');) {
        if (std::filesystem::path found = folder + "/nats-server";
            !folder.empty() && isProgram(found)) {
            return found;
        }
    }
    throw std::runtime_error(
        "there is no nats-server, which browsers and other programs connect to: install the Debian "
        "package nats-server, name the program with --nats-server, or use servers that run "
        "elsewhere with --nats");
}

NatsProcess::NatsProcess(const std::filesystem::path& program,
                         const std::filesystem::path& configuration, int stop)
    : folder_(withoutPortsFiles(configuration.parent_path())),
      stop_(stop),
      process_(program, {"--config", configuration.string()}, garbageCollection()) {}

std::optional<NatsPorts> NatsProcess::ports() const {
    for (const std::filesystem::path& path : portsFilesIn(folder_)) {
        std::ifstream file(path);
        const std::string text(std::istreambuf_iterator<char>(file), {});
        json::Object urls = json::parse(text);  // Empty while the file is being written.
        const NatsPorts ports{portIn(urls["nats"]), portIn(urls["websocket"])};
        if (ports.client != 0 && ports.webSocket != 0) {
            return ports;
        }
    }
    return std::nullopt;
}

NatsProcess::State NatsProcess::follow(milliseconds timeout) {
    const Clock::time_point end = Clock::now() + timeout;
    State state = State::runs;
    while (state == State::runs) {
        const auto left = std::chrono::duration_cast<milliseconds>(end - Clock::now());
        if (timeout != forever && left < milliseconds::zero()) {
            return State::runs;
        }
        state = followOnce(timeout == forever ? forever : left);
    }
    return state;
}

void NatsProcess::followUntil(const std::future<void>& end) {
    while (end.wait_for(milliseconds::zero()) != std::future_status::ready) {
        if (isReadable(process_.output(), eventInterval) && !logOutput()) {
            end.wait();
        }
    }
}

void NatsProcess::end() {
    process_.send(SIGTERM);
    const Clock::time_point latest = Clock::now() + longestStop;
    while (Clock::now() < latest && isReadable(process_.output(), longestStop)) {
        if (!logOutput()) {
            return;
        }
    }
    spdlog::warn("nats-server does not exit; killing it");
}

std::string NatsProcess::collect() {
    return process_.collect() + (complaint_.empty() ? "" : ": " + complaint_);
}

NatsProcess::State NatsProcess::followOnce(milliseconds timeout) {
    std::array<pollfd, 2> waited{{{process_.output(), POLLIN, 0}, {stop_, POLLIN, 0}}};
    if (::poll(waited.data(), waited.size(), static_cast<int>(timeout.count())) <= 0) {
        return State::runs;
    }
    if (waited[1].revents != 0) {
        return State::isToStop;
    }
    return waited[0].revents == 0 || logOutput() ? State::runs : State::hasEnded;
}

// Logs what the server has written; false when it has ended.
bool NatsProcess::logOutput() {
    std::array<char, 4096> chunk{};
    const std::size_t count = readSome(process_.output(), chunk.data(), chunk.size());
    said_.append(chunk.data(), count);
    for (std::size_t end = said_.find('\n'); end != std::string::npos; end = said_.find('\n')) {
        log(said_.substr(0, end));
        said_.erase(0, end + 1);
    }
    return count > 0;
}

// Most of the server's output is of no interest: it warns of intended settings.
void NatsProcess::log(const std::string& line) {
    const bool isError = line.find("[ERR]") != std::string::npos;
    const bool isFatal = line.find("[FTL]") != std::string::npos ||
                         line.starts_with("nats-server:") || line.starts_with("panic:");
    const bool isLoss = line.find("Slow Consumer") != std::string::npos;
    if (isError || isFatal) {
        complaint_ = line;
    }
    spdlog::log(isFatal             ? spdlog::level::err
                : isError || isLoss ? spdlog::level::warn
                                    : spdlog::level::debug,
                "nats-server: {}", line);
}

}  // namespace host
