// SPDX-License-Identifier: Apache-2.0
#include "host/commands/serve_command.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <spdlog/spdlog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "framework/bundle_runner.h"
#include "host/bus/bundle_location.h"
#include "host/bus/failed_reads.h"
#include "host/bus/request_admission.h"
#include "host/bus/serving_client.h"
#include "host/commands/stop_signals.h"
#include "host/exit_status.h"
#include "host/files/file_service.h"
#include "host/guard/guarded_client.h"
#include "host/limits/confinement.h"
#include "host/limits/memory_limit.h"
#include "host/limits/open_files.h"
#include "host/metrics/health_check.h"
#include "host/metrics/metrics_server.h"
#include "host/server/private_folder.h"
#include "host/standard_streams.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/resolved.h"
#include "platform/messaging/transport.h"
#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

using platform::messaging::MemoryBudget;
using platform::messaging::NatsBus;
using platform::messaging::NatsOptions;

using ConnectClient =
    std::function<std::shared_ptr<platform::messaging::MessageService>(const std::string& name)>;

// The process's transport, while it lives: the bundle gets its client by `connect`.
class ServingTransport {
public:
    ServingTransport(const ConnectClient& connect, const Guard& guard) {
        using namespace platform::messaging;
        setTransport([=](const std::string& name, const MessageServiceOptions&) {
            std::shared_ptr<MessageService> client = connect(name);
            if (guard.saves) {
                client = savingSafely(std::move(client), guard);
            }
            return resolved([&client] { return client; });
        });
    }
    ServingTransport(const ServingTransport&) = delete;
    ServingTransport& operator=(const ServingTransport&) = delete;
    ~ServingTransport() { platform::messaging::setTransport({}); }
};

// The name under which the host is a client of the servers.
constexpr const char* clientName = "serialization_host";

// How long the servers may be out of reach when the host starts.
constexpr std::chrono::seconds longestConnect{5};

// How long the requests that were taken may still run when the host shuts down.
constexpr std::chrono::seconds longestDrain{60};

// To servers, what follows white space is the next word of their protocol.
void requireGroup(const std::string& group) {
    const bool isValid = !group.empty() && std::all_of(group.begin(), group.end(), [](char c) {
        return c > ' ' && c < '\x7f';
    });
    if (!isValid) {
        throw std::runtime_error(
            "\"" + group +
            "\" is not a name for --group: it may hold neither white space nor "
            "characters other than those of ASCII");
    }
}

// Warns of a folder that cannot be read, before clients are told that their documents are empty.
void requireReadable(const std::vector<std::filesystem::path>& roots) {
    for (const std::filesystem::path& root : roots) {
        const platform::FileDescriptor opened(
            ::open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        if (!opened || ::faccessat(AT_FDCWD, root.c_str(), X_OK, AT_EACCESS) != 0) {
            throw std::runtime_error("cannot read the folder " + root.string() +
                                     " of --root: " + std::generic_category().message(errno));
        }
    }
}

// Where clients find their documents. Without roots they are kept to no folder.
std::vector<std::filesystem::path> rootsToTell(const std::vector<std::filesystem::path>& roots) {
    if (roots.empty()) {
        return {"/"};
    }
    std::vector<std::filesystem::path> told;
    for (const std::filesystem::path& root : roots) {
        told.push_back(std::filesystem::absolute(root).lexically_normal());
    }
    return told;
}

// The first line of `file`, which holds a secret.
std::string secretIn(const std::filesystem::path& file) {
    std::ifstream input(file);
    std::string secret;
    if (!std::getline(input, secret) || secret.empty()) {
        throw std::runtime_error("cannot read a token or password from " + file.string());
    }
    if (secret.back() == '\r') {
        secret.pop_back();
    }
    return secret;
}

NatsOptions connectionTo(const OtherServers& servers) {
    requireGroup(servers.group);
    NatsOptions options;
    options.servers = servers.urls;
    options.credentialsFile = servers.credentialsFile.string();
    options.user = servers.user;
    if (!servers.tokenFile.empty()) {
        options.token = secretIn(servers.tokenFile);
    }
    if (!servers.passwordFile.empty()) {
        options.password = secretIn(servers.passwordFile);
    }
    options.tls.caFile = servers.caFile.string();
    options.tls.certificateFile = servers.certificateFile.string();
    options.tls.keyFile = servers.keyFile.string();
    options.tls.enabled = !servers.caFile.empty() || !servers.certificateFile.empty();
    options.queueGroup = servers.group;
    options.queueChannels = {platform::messaging::readRequestChannel,
                             platform::messaging::writeRequestChannel,
                             platform::messaging::filesRequestChannel};
    return options;
}

// The memory for requests has fixed shares for those that come in pieces, for long answers, and for
// requests that are being handled, each of which takes its bytes and its values, more than twice
// its length. If they shared it, transfers and waiting requests could hold all of it, while the
// request that is next waits for more.
constexpr std::uint64_t memoryOfTransfers(std::uint64_t memoryForRequests) {
    return memoryForRequests / 5;
}
constexpr std::uint64_t memoryToHandle(std::uint64_t memoryForRequests) {
    return memoryForRequests - 2 * memoryOfTransfers(memoryForRequests);
}

std::shared_ptr<NatsBus> makeBus(NatsOptions options, const ServeOptions& serve) {
    options.connectTimeout = longestConnect;
    // Counted now: it opens files that the confined threads may not open.
    options.concurrency = std::max(2U, std::thread::hardware_concurrency());
    // Many documents that are saved at once must not hold up those that are read.
    options.separateChannels = {platform::messaging::writeRequestChannel};
    // A large document must not hold up the small ones behind it.
    options.concurrentChannels = {platform::messaging::readRequestChannel,
                                  platform::messaging::filesRequestChannel};
    options.longMessages.answerPrefixes = {
        {platform::messaging::readRequestChannel, platform::messaging::readResponsePrefix},
        {platform::messaging::writeRequestChannel, platform::messaging::writeResponsePrefix},
        {platform::messaging::filesRequestChannel, platform::messaging::filesResponsePrefix}};
    options.longMessages.maxMessage = serve.largestMessage;
    options.longMessages.maxIncomingBytes = memoryOfTransfers(serve.memoryForRequests);
    options.longMessages.maxOutgoingBytes = memoryOfTransfers(serve.memoryForRequests);
    return NatsBus::create(std::move(options));
}

// What each kind of thread may open.
struct Confinements {
    Confinement bundle;     // While it starts: its framework may read it once more.
    Confinement documents;  // While it handles requests: it is not a document.
    Confinement network;
    Confinement web;
    Confinement metrics;
};

// Confines the thread that calls the result, if there are confinements, which must outlive it.
std::function<void()> confining(const std::optional<Confinements>& confinements,
                                Confinement Confinements::*part) {
    return [&confinements, part] {
        if (confinements) {
            ((*confinements).*part).confineThisThread();
        }
    };
}

// The files that each new connection needs: to find servers by name, to trust them, and to log in.
std::vector<std::filesystem::path> filesOf(const OtherServers& servers) {
    if (servers.urls.empty()) {
        return {};
    }
    std::vector<std::filesystem::path> files{"/etc", "/usr", "/lib", "/lib64", "/run"};
    for (const std::filesystem::path& file :
         {servers.credentialsFile, servers.caFile, servers.certificateFile, servers.keyFile}) {
        if (!file.empty()) {
            // By its folder, since such files are replaced by renaming.
            files.push_back(std::filesystem::absolute(file).parent_path());
        }
    }
    std::erase_if(files, [](const auto& file) { return !std::filesystem::exists(file); });
    return files;
}

std::optional<Confinements> confinementsOf(const ServeOptions& options,
                                           const std::filesystem::path& webFolder) {
    if (options.roots.empty() || !options.isConfined) {
        spdlog::warn("clients can read and write whatever the user of this program can; {}",
                     options.roots.empty() ? "--root DIR keeps them to a folder"
                                           : "--root has no effect with --no-confinement");
        return std::nullopt;
    }
    if (const std::optional<std::string> reason = whyConfinementIsUnavailable()) {
        throw std::runtime_error("cannot keep to the folders of --root: " + *reason +
                                 "; --no-confinement goes without");
    }
    return Confinements{
        Confinement({options.roots, {options.bundle}}), Confinement({options.roots, {}}),
        Confinement({{}, filesOf(options.otherServers)}),
        Confinement({{},
                     webFolder.empty() ? std::vector<std::filesystem::path>{}
                                       : std::vector<std::filesystem::path>{webFolder}}),
        Confinement(Grants{})};
}

// Keeps a library loaded, so that a confined thread can load it again without opening its files.
class LoadedLibrary {
public:
    // A failure is reported when the library is loaded again.
    explicit LoadedLibrary(const std::filesystem::path& file)
        : handle_(::dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL)) {}
    LoadedLibrary(const LoadedLibrary&) = delete;
    LoadedLibrary& operator=(const LoadedLibrary&) = delete;
    ~LoadedLibrary() {
        if (handle_ != nullptr) {
            ::dlclose(handle_);
        }
    }

private:
    void* handle_;
};

bool isReady(const std::shared_future<void>& future) {
    return future.wait_for(std::chrono::seconds::zero()) == std::future_status::ready;
}

// Connects `bus` on a thread of its own, which calls `prepare` first and from which the threads of
// the connection come. Gives up when `stop` becomes ready; returns false then.
bool connect(NatsBus& bus, const std::function<void()>& prepare,
             const std::shared_future<void>& stop) {
    std::future<void> connected = std::async(std::launch::async, [&] {
        prepare();
        bus.connect(clientName).get();
    });
    while (connected.wait_for(std::chrono::milliseconds(10)) == std::future_status::timeout) {
        if (isReady(stop)) {
            bus.drain(std::chrono::milliseconds::zero());
            return false;
        }
    }
    connected.get();
    return true;
}

// The page's address, with what the page needs to connect in the fragment, which browsers do not
// send.
std::string pageUrl(const WebServer& web, const NatsServer* server) {
    std::string url = web.origin() + "/";
    if (server != nullptr) {
        const Login& editor = server->users().editor;
        url += "#server=ws://" + server->webSocketAddress() + "&user=" + editor.user +
               "&password=" + editor.password;
    }
    return url;
}

void tellHowToConnect(const WebServer* web, const MetricsServer* metrics, const NatsServer* server,
                      int output) {
    std::string lines;
    if (web != nullptr) {
        lines += "page: " + pageUrl(*web, server) + "\n";
    }
    if (metrics != nullptr) {
        lines += "metrics: " + metrics->address().origin() + "/metrics\n";
    }
    if (server != nullptr) {
        const Login& editor = server->users().editor;
        const std::string login = editor.user + ":" + editor.password + "@";
        lines += "nats: nats://" + login + server->address() + "\n";
        lines += "websocket: ws://" + login + server->webSocketAddress() + "\n";
    }
    writeAll(output, {lines});
}

std::filesystem::path webFolderOf(const WebOptions& options) {
    if (!options.isServed) {
        return {};
    }
    return options.folder.empty() ? findWebFolder() : options.folder;
}

std::unique_ptr<WebServer> makeWebServer(const WebOptions& options,
                                         const std::filesystem::path& folder) {
    if (folder.empty()) {
        return nullptr;
    }
    HttpLimits limits;
    limits.connectionsOfAddress = options.connectionsOfAddress;
    return std::make_unique<WebServer>(folder, options.address, limits);
}

std::unique_ptr<NatsServer> startOwnServer(const ServeOptions& options, const WebServer* web,
                                           const PrivateFolder& folder) {
    NatsServerOptions own = options.ownServer;
    if (web != nullptr) {
        own.allowedOrigins.push_back(web->origin());
    }
    return std::make_unique<NatsServer>(std::move(own), folder);
}

// The server for monitoring; it checks the roots while it lives.
std::unique_ptr<MetricsServer> makeMetricsServer(const ServeOptions& options,
                                                 const std::shared_ptr<const NatsBus>& bus,
                                                 const std::shared_ptr<const MemoryBudget>& budget,
                                                 std::shared_ptr<const RequestMetrics> requests) {
    if (!options.metrics) {
        return nullptr;
    }
    MetricsSources sources;
    sources.version = PROGRAM_VERSION;
    sources.requests = std::move(requests);
    sources.isConnected = [bus] { return bus->isConnected(); };
    sources.reconnects = [bus] { return bus->reconnects(); };
    sources.backlog = [bus] {
        const platform::messaging::NatsBacklog backlog = bus->backlog();
        return BusBacklog{backlog.messages, backlog.bytes, backlog.dropped};
    };
    sources.requestMemory = [budget] { return RequestMemory{budget->reserved(), budget->size()}; };
    sources.areRootsReadable = [check = std::make_shared<HealthCheck>([roots = options.roots] {
                                    return areReadable(roots);
                                })] { return check->isHealthy(); };
    return std::make_unique<MetricsServer>(*options.metrics, std::move(sources));
}

}  // namespace

int runServe(const ServeOptions& options, int output) {
    blockStopSignals();
    raiseOpenFileLimit();
    requireReadable(options.roots);
    std::optional<PrivateFolder> folder;
    if (options.otherServers.urls.empty()) {
        folder.emplace();
    }
    const StopSignals signals([&folder] {
        if (folder) {
            folder->remove();
        }
    });

    const std::filesystem::path webFolder = webFolderOf(options.web);
    // The thread that keeps earlier versions opens files that clients may not reach.
    const Guard guard = makeGuard(options.guard, options.roots);
    const std::optional<Confinements> confinements = confinementsOf(options, webFolder);
    // The web page's origin is part of the server's configuration.
    const std::unique_ptr<WebServer> web = makeWebServer(options.web, webFolder);
    std::unique_ptr<NatsServer> server =
        folder ? startOwnServer(options, web.get(), *folder) : nullptr;
    const std::shared_ptr<NatsBus> bus =
        makeBus(server ? server->workerConnection() : connectionTo(options.otherServers), options);
    if (!connect(*bus, confining(confinements, &Confinements::network), signals.first())) {
        return exitDone;
    }
    if (web) {
        web->start(confining(confinements, &Confinements::web));
    }

    ServingOptions serving;
    serving.roots = options.roots;
    const RequestBudgets budgets(memoryToHandle(options.memoryForRequests),
                                 memoryForDocuments(options.memoryForRequests));
    const std::unique_ptr<MetricsServer> metrics =
        makeMetricsServer(options, bus, budgets.requests, serving.metrics);
    const LoadedLibrary library(options.bundle);
    // The threads that handle requests come from this one.
    confining(confinements, &Confinements::bundle)();
    serving.prepareThread = confining(confinements, &Confinements::documents);
    const ConnectClient connectClient = [bus, budgets, serving](const std::string& name) {
        // The bus is connected, so get() does not wait. A request that waits for memory may be
        // handled on another thread than the one that brought it, and is counted on that.
        return answeringFailedReads(servingClient(
            admittingRequests(bus->connect(name).get(), budgets, serving.metrics), serving));
    };
    const ServingTransport transport(connectClient, guard);
    const framework::BundleRunner bundle(options.bundle);
    serving.subscriptionFailure->check();
    const FileService files(connectClient(clientName), guard, rootsToTell(options.roots));
    if (metrics) {
        metrics->start(confining(confinements, &Confinements::metrics));
    }
    tellHowToConnect(web.get(), metrics.get(), server.get(), output);
    signals.first().wait();
    if (!bus->drain(longestDrain)) {
        spdlog::error("requests are still unfinished after {} s and are abandoned",
                      longestDrain.count());
        server.reset();
        spdlog::default_logger()->flush();
        std::_Exit(exitRequestFailed);  // Destroying the bundle would wait for them.
    }
    return exitDone;
}

}  // namespace host
