// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_server.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spdlog/spdlog.h>
#include <sys/eventfd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <iterator>
#include <optional>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "host/commands/standard_streams.h"
#include "host/server/child_process.h"
#include "platform/messaging/nats/client_backlog.h"

namespace host {

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// How long the server may take to be ready, and to end when it is asked to.
constexpr milliseconds longestStart{30'000};
constexpr milliseconds longestStop{5'000};

// How long its clients may take to read what it has for them before it is stopped, and how often to
// look whether they have.
constexpr milliseconds longestDelivery{10'000};
constexpr milliseconds deliveryInterval{10};

constexpr milliseconds forever{-1};

// How often to look whether the server is ready.
constexpr milliseconds readyInterval{10};

// How long to wait before the server is started again: twice as long each time, from the first to
// the last of these, and from the first again after the server has run for a while.
constexpr milliseconds shortestPause{50};
constexpr milliseconds longestPause{5'000};
constexpr milliseconds longEnoughRun{10'000};

// Where Debian has the program, which is not among the folders of most users' PATH.
constexpr const char* systemFolders = ":/usr/local/sbin:/usr/sbin:/sbin";

bool isProgram(const std::filesystem::path& file) {
    std::error_code ignored;
    return std::filesystem::is_regular_file(file, ignored) && ::access(file.c_str(), X_OK) == 0;
}

std::filesystem::path findProgram() {
    const char* path = std::getenv("PATH");
    std::istringstream folders((path == nullptr ? "" : path) + std::string(systemFolders));
    for (std::string folder; std::getline(folders, folder, ':');) {
        if (std::filesystem::path program = folder + "/nats-server";
            !folder.empty() && isProgram(program)) {
            return program;
        }
    }
    throw std::runtime_error(
        "there is no nats-server, which browsers and other programs connect to: install the Debian "
        "package nats-server, name the program with --nats-server, or use servers that run "
        "elsewhere with --nats");
}

std::filesystem::path programOrDefault(const std::filesystem::path& program) {
    if (program.empty()) {
        return findProgram();
    }
    if (!isProgram(program)) {
        throw std::runtime_error("there is no program " + program.string() +
                                 "; the Debian package nats-server has one");
    }
    return program;
}

bool isReadable(int fd, milliseconds timeout) {
    pollfd waited{fd, POLLIN, 0};
    return ::poll(&waited, 1, static_cast<int>(timeout.count())) > 0;
}

// The port in `text`, a URL of which begins with `scheme`.
std::optional<std::uint16_t> portIn(const std::string& text, const std::string& scheme) {
    std::smatch match;
    if (!std::regex_search(text, match,
                           std::regex("\"" + scheme + R"re(://127\.0\.0\.1:([0-9]{1,5})")re"))) {
        return std::nullopt;
    }
    return static_cast<std::uint16_t>(std::stoul(match[1]));
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

// "0100007F:1F90", as the system writes an address and port.
std::uint16_t portOfAddress(const std::string& address) {
    return static_cast<std::uint16_t>(
        std::stoul(address.substr(address.rfind(':') + 1), nullptr, 16));
}

// Whether the system holds bytes of connections to these ports of the loopback interface, which one
// end has sent and the other has not read.
bool hasBytesUnderWay(const std::array<std::uint16_t, 2>& ports) {
    const auto isOne = [&](const std::string& address) {
        return std::find(ports.begin(), ports.end(), portOfAddress(address)) != ports.end();
    };
    std::ifstream table("/proc/self/net/tcp");
    std::string line;
    std::getline(table, line);  // The names of the columns.
    while (std::getline(table, line)) {
        std::istringstream columns(line);
        std::string index, local, remote, state, queues;
        columns >> index >> local >> remote >> state >> queues;
        constexpr const char* established = "01";
        if (state == established && queues != "00000000:00000000" &&
            (isOne(local) || isOne(remote))) {
            return true;
        }
    }
    return false;
}

void writePrivateFile(const std::filesystem::path& file, std::string_view text) {
    const platform::FileDescriptor to(
        ::open(file.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, S_IRUSR | S_IWUSR));
    if (to.get() < 0) {
        throw std::system_error(errno, std::generic_category(), file.string());
    }
    writeAll(to.get(), {text});
}

}  // namespace

// One life of the server's process, from its start to its end.
class NatsServer::Life {
public:
    enum class State { runs, hasEnded, isToStop };

    // `stop` is a descriptor that becomes readable when the server is to be stopped.
    Life(const std::filesystem::path& program, const std::filesystem::path& configuration, int stop)
        : process_(program, {"--config", configuration.string()}), stop_(stop) {}

    // Passes on what the server says until the state is another than `runs`, or for `timeout`.
    State follow(milliseconds timeout) {
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

    // Passes on what the server says until `end` is ready: a server that nobody listens to comes to
    // a stop when it has something to say.
    void followUntil(const std::future<void>& end) {
        while (end.wait_for(milliseconds::zero()) != std::future_status::ready) {
            if (isReadable(process_.output(), deliveryInterval) && !passOn()) {
                end.wait();
            }
        }
    }

    // Ends the server, if need be by force.
    void end() {
        process_.send(SIGTERM);
        const Clock::time_point latest = Clock::now() + longestStop;
        while (Clock::now() < latest && isReadable(process_.output(), longestStop)) {
            if (!passOn()) {
                return;
            }
        }
        spdlog::warn("nats-server does not end; killing it");
    }

    // Waits for the server's end and tells how it was, with the last error that the server told of.
    std::string collect() {
        return process_.collect() + (complaint_.empty() ? "" : ": " + complaint_);
    }

private:
    State followOnce(milliseconds timeout) {
        std::array<pollfd, 2> waited{{{process_.output(), POLLIN, 0}, {stop_, POLLIN, 0}}};
        if (::poll(waited.data(), waited.size(), static_cast<int>(timeout.count())) <= 0) {
            return State::runs;
        }
        if (waited[1].revents != 0) {
            return State::isToStop;
        }
        return waited[0].revents == 0 || passOn() ? State::runs : State::hasEnded;
    }

    // Logs what the server has said; false when it has ended.
    bool passOn() {
        std::array<char, 4096> chunk{};
        const std::size_t count = readSome(process_.output(), chunk.data(), chunk.size());
        said_.append(chunk.data(), count);
        for (std::size_t end = said_.find('\n'); end != std::string::npos; end = said_.find('\n')) {
            log(said_.substr(0, end));
            said_.erase(0, end + 1);
        }
        return count > 0;
    }

    // Most of what the server says is of no interest: it warns of what is meant to be.
    void log(const std::string& line) {
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

    ChildProcess process_;
    int stop_;
    std::string said_;  // The beginning of a line.
    std::string complaint_;
};

NatsServer::NatsServer(NatsServerOptions options, const PrivateFolder& folder)
    : program_(programOrDefault(options.program)),
      folder_(folder),
      stop_(::eventfd(0, EFD_CLOEXEC)) {
    if (stop_.get() < 0) {
        throw std::system_error(errno, std::generic_category(), "cannot make an eventfd");
    }
    configuration_.runtimeFolder = folder_.path();
    configuration_.port = options.port;
    configuration_.webSocketPort = options.webSocketPort;
    configuration_.users = {{"worker", makePassword()}, {"editor", makePassword()}};
    configuration_.allowedOrigins = std::move(options.allowedOrigins);

    std::promise<void> ready;
    std::future<void> whenReady = ready.get_future();
    supervisor_ = std::thread(&NatsServer::supervise, this, std::move(ready));
    try {
        whenReady.get();
    } catch (...) {
        supervisor_.join();
        throw;
    }
}

platform::messaging::NatsOptions NatsServer::workerConnection() const {
    platform::messaging::NatsOptions options;
    options.servers = {"nats://" + address()};
    options.user = configuration_.users.worker.user;
    options.password = configuration_.users.worker.password;
    return options;
}

NatsServer::~NatsServer() {
    ::eventfd_write(stop_.get(), 1);
    supervisor_.join();
}

void NatsServer::supervise(std::promise<void> ready) {
    bool hasBeenReady = false;
    const auto whenReady = [&] {
        spdlog::info("nats-server takes connections at {} and, of browsers, at {}", address(),
                     webSocketAddress());
        if (!std::exchange(hasBeenReady, true)) {
            ready.set_value();
        }
    };
    milliseconds pause = shortestPause;
    for (;;) {
        const Clock::time_point start = Clock::now();
        const std::optional<std::string> end = live(whenReady);
        if (!end) {
            break;
        }
        if (!hasBeenReady) {
            ready.set_exception(std::make_exception_ptr(
                std::runtime_error("nats-server does not start (" + *end + ")")));
            return;
        }
        if (Clock::now() - start > longEnoughRun) {
            pause = shortestPause;
        }
        spdlog::warn("nats-server has ended ({}) and is started again", *end);
        if (isReadable(stop_.get(), pause)) {
            break;
        }
        pause = std::min(2 * pause, longestPause);
    }
    // Whose folder it is may not be allowed to do this any more.
    folder_.remove();
}

// Runs the server until it ends and tells how it ended; nothing when it has been stopped.
std::optional<std::string> NatsServer::live(const std::function<void()>& whenReady) {
    try {
        removePortsFiles();
        const std::filesystem::path file = folder_.path() / "nats-server.conf";
        writePrivateFile(file, configurationText(configuration_));
        Life life(program_, file, stop_.get());
        Life::State state = Life::State::runs;
        const Clock::time_point latest = Clock::now() + longestStart;
        while (state == Life::State::runs && !findPorts()) {
            if (Clock::now() > latest) {
                return "it is not ready after " + std::to_string(longestStart.count()) + " ms";
            }
            state = life.follow(readyInterval);
        }
        if (state == Life::State::runs) {
            whenReady();
            state = life.follow(forever);
        }
        if (state == Life::State::isToStop) {
            life.followUntil(std::async(std::launch::async, [this] { waitForClients(); }));
            life.end();
            return std::nullopt;
        }
        return life.collect();
    } catch (const std::exception& error) {
        return error.what();
    }
}

// Waits until clients have what they were sent: a server that is stopped drops what it has not
// sent, and what it has sent is lost with the connection when a client sends something just then.
void NatsServer::waitForClients() const {
    const Clock::time_point latest = Clock::now() + longestDelivery;
    try {
        bool isDone =
            platform::messaging::waitForClientBacklog(workerConnection(), longestDelivery);
        while (isDone && hasBytesUnderWay({configuration_.port, configuration_.webSocketPort})) {
            isDone = Clock::now() < latest;
            std::this_thread::sleep_for(deliveryInterval);
        }
        if (!isDone) {
            spdlog::warn("clients have not taken their answers after {} s and do not get them",
                         longestDelivery.count() / 1000);
        }
    } catch (const std::exception& error) {
        spdlog::warn("clients may not get their last answers: {}", error.what());
    }
}

// What servers that were killed have left, so that it is not taken for what the next one says.
void NatsServer::removePortsFiles() const {
    for (const std::filesystem::path& file : portsFilesIn(folder_.path())) {
        std::filesystem::remove(file);
    }
}

// Looks for the file in which a server that is ready tells its ports. Returns whether there is one.
bool NatsServer::findPorts() {
    for (const std::filesystem::path& path : portsFilesIn(folder_.path())) {
        std::ifstream file(path);
        const std::string text(std::istreambuf_iterator<char>(file), {});
        const std::optional<std::uint16_t> port = portIn(text, "nats");
        const std::optional<std::uint16_t> webSocketPort = portIn(text, "ws");
        if (!port || !webSocketPort) {
            return false;  // It is being written.
        }
        if (configuration_.port == 0 || configuration_.webSocketPort == 0) {
            configuration_.port = *port;
            configuration_.webSocketPort = *webSocketPort;
        }
        return true;
    }
    return false;
}

}  // namespace host
