// SPDX-License-Identifier: Apache-2.0
// Requests over NATS: the bundle on the NATS bus, beside a bare echo written with libnats, which
// answers at once with the same bytes, and an echo on the NATS bus. All are asked in turn, in one
// run, by the same clients through the same server.
//
//     nats_benchmark REPETITIONS                      measures, prints JSON
//     nats_benchmark echo|bus URL CHANNEL=FILE...     a worker that answers with the file's bytes
//     nats_benchmark bundle URL BUNDLE                a worker that is the bundle
#include <nats/nats.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "framework/bundle_runner.h"
#include "host/server/child_process.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/transport.h"
#include "tests/support/temporary_directory.h"

namespace {

using namespace platform::messaging;
using Clock = std::chrono::steady_clock;

constexpr std::size_t clientCount = 10;
constexpr std::size_t workerCount = 2;
constexpr std::int64_t patience = 30'000;  // milliseconds

void check(natsStatus status) {
    if (status != NATS_OK) {
        throw std::runtime_error(std::string("libnats: ") + natsStatus_GetText(status));
    }
}

std::string contentOf(const std::filesystem::path& file) {
    std::ifstream stream(file, std::ios_base::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
}

// A request begins with {"rtcId":"<id>", where the id has no quotes.
std::string responseChannel(std::string_view request) {
    const std::string_view behind = request.substr(std::string_view(R"({"rtcId":")").size());
    return readResponsePrefix + std::string(behind.substr(0, behind.find('"')));
}

std::string requestFor(const std::string& id, const std::filesystem::path& file) {
    return R"({"rtcId":")" + id + R"(","contentType":"text/plain","filePath":")" + file.string() +
           "\"}";
}

// ---- Workers ----

struct Answer {
    std::string channel;
    std::string bytes;
};

std::vector<Answer> answersOf(const std::vector<std::string>& arguments) {
    std::vector<Answer> answers;
    for (const std::string& argument : arguments) {
        const std::size_t equals = argument.find('=');
        answers.push_back({argument.substr(0, equals), contentOf(argument.substr(equals + 1))});
    }
    return answers;
}

natsConnection* connectTo(const std::string& url) {
    natsOptions* options = nullptr;
    check(natsOptions_Create(&options));
    check(natsOptions_SetURL(options, url.c_str()));
    check(natsOptions_SetSendAsap(options, true));
    natsConnection* connection = nullptr;
    check(natsConnection_Connect(&connection, options));
    natsOptions_Destroy(options);
    return connection;
}

void answerBarely(natsConnection* connection, natsSubscription*, natsMsg* request, void* closure) {
    const auto& answer = *static_cast<const Answer*>(closure);
    const std::string channel = responseChannel(
        {natsMsg_GetData(request), static_cast<std::size_t>(natsMsg_GetDataLength(request))});
    natsConnection_Publish(connection, channel.c_str(), answer.bytes.data(),
                           static_cast<int>(answer.bytes.size()));
    natsMsg_Destroy(request);
}

[[noreturn]] void sleepForGood() {
    for (;;) {
        ::pause();
    }
}

[[noreturn]] void runEcho(const std::string& url, std::vector<Answer> answers) {
    natsConnection* const connection = connectTo(url);
    for (Answer& answer : answers) {
        natsSubscription* subscription = nullptr;
        check(natsConnection_QueueSubscribe(&subscription, connection, answer.channel.c_str(),
                                            "echo", answerBarely, &answer));
    }
    sleepForGood();
}

NatsOptions busOptions(const std::string& url, const std::vector<std::string>& channels) {
    NatsOptions options;
    options.servers = {url};
    options.queueGroup = "workers";
    options.queueChannels = channels;
    options.concurrentChannels = channels;
    return options;
}

[[noreturn]] void runBusEcho(const std::string& url, const std::vector<Answer>& answers) {
    std::vector<std::string> channels;
    for (const Answer& answer : answers) {
        channels.push_back(answer.channel);
    }
    const auto bus = NatsBus::create(busOptions(url, channels));
    const auto client = bus->connect("bus").get();
    std::vector<std::shared_ptr<Subscription>> subscriptions;
    for (const Answer& answer : answers) {
        subscriptions.push_back(client
                                    ->subscribe(answer.channel,
                                                [&](const JsonMessage& request) {
                                                    client->publish(
                                                        responseChannel(request.payload()),
                                                        platform::DataBuffer::copyOf(answer.bytes));
                                                })
                                    .get());
    }
    sleepForGood();
}

[[noreturn]] void runBundle(const std::string& url, const std::string& file) {
    const auto bus = NatsBus::create(busOptions(url, {readRequestChannel}));
    const auto client = bus->connect("host").get();
    setTransport([bus](const std::string& name, const MessageServiceOptions&) {
        return bus->connect(name);
    });
    const framework::BundleRunner bundle(file);
    sleepForGood();
}

// ---- Clients ----

class Client {
public:
    Client(const std::string& url, std::string id)
        : connection_(connectTo(url)), id_(std::move(id)) {
        check(natsConnection_SubscribeSync(&answers_, connection_,
                                           (readResponsePrefix + id_).c_str()));
        check(natsSubscription_SetPendingLimits(answers_, -1, -1));
        check(natsConnection_Flush(connection_));
    }
    Client(const Client&) = delete;
    Client& operator=(const Client&) = delete;
    ~Client() {
        natsSubscription_Destroy(answers_);
        natsConnection_Destroy(connection_);
    }

    const std::string& id() const { return id_; }

    // Throws when no answer comes within `milliseconds`.
    std::string ask(const std::string& channel, const std::string& request,
                    std::int64_t milliseconds = patience) {
        natsMsg* answer = send(channel, request, milliseconds);
        std::string bytes(natsMsg_GetData(answer),
                          static_cast<std::size_t>(natsMsg_GetDataLength(answer)));
        natsMsg_Destroy(answer);
        return bytes;
    }

    // Asks again and again until `end`; returns what each took, in seconds.
    std::vector<double> askUntil(Clock::time_point end, const std::string& channel,
                                 const std::string& request, std::size_t answerSize) {
        std::vector<double> waits;
        for (Clock::time_point start = Clock::now(); start < end;) {
            natsMsg* answer = send(channel, request, patience);
            const Clock::time_point now = Clock::now();
            if (static_cast<std::size_t>(natsMsg_GetDataLength(answer)) != answerSize) {
                throw std::runtime_error("an answer is not what it should be");
            }
            natsMsg_Destroy(answer);
            waits.push_back(std::chrono::duration<double>(now - start).count());
            start = now;
        }
        return waits;
    }

private:
    natsMsg* send(const std::string& channel, const std::string& request,
                  std::int64_t milliseconds) {
        check(natsConnection_Publish(connection_, channel.c_str(), request.data(),
                                     static_cast<int>(request.size())));
        natsMsg* answer = nullptr;
        check(natsSubscription_NextMsg(&answer, answers_, milliseconds));
        return answer;
    }

    natsConnection* connection_;
    natsSubscription* answers_ = nullptr;
    std::string id_;
};

// ---- Measuring ----

struct Input {
    std::string name;
    std::filesystem::path file;
    std::size_t answerSize = 0;
    std::chrono::milliseconds duration;
};

// Waits until all workers answer on `channel`.
void warmUp(Client& client, const std::string& channel, const std::string& request) {
    for (int attempt = 0;; ++attempt) {
        try {
            client.ask(channel, request, 500);
            break;
        } catch (const std::runtime_error&) {
            if (attempt == 60) {
                throw;
            }
        }
    }
    for (int i = 0; i < 20; ++i) {
        client.ask(channel, request);
    }
}

void measure(std::vector<std::unique_ptr<Client>>& clients, const std::string& channel,
             const Input& input, const std::string& who, std::string& separator) {
    std::vector<std::vector<double>> waits(clients.size());
    std::vector<std::thread> threads;
    const Clock::time_point start = Clock::now();
    for (std::size_t i = 0; i < clients.size(); ++i) {
        threads.emplace_back([&, i] {
            waits[i] =
                clients[i]->askUntil(start + input.duration, channel,
                                     requestFor(clients[i]->id(), input.file), input.answerSize);
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    const double seconds = std::chrono::duration<double>(Clock::now() - start).count();
    std::vector<double> all;
    for (const auto& some : waits) {
        all.insert(all.end(), some.begin(), some.end());
    }
    std::sort(all.begin(), all.end());
    const auto count = static_cast<double>(all.size());
    std::cout << separator << R"({"name":")" << input.name << "/" << who
              << R"(","bytes_per_second":)"
              << count * static_cast<double>(input.answerSize) / seconds << R"(,"µs per request":)"
              << 1e6 * seconds / count << R"(,"ms until the answer":)" << 1e3 * all[all.size() / 2]
              << R"(,"ms at most, of 99 in 100":)" << 1e3 * all[all.size() * 99 / 100] << '}'
              << std::flush;
    separator = ",\n";
}

void writeText(const std::filesystem::path& file, std::size_t size) {
    std::string text;
    while (text.size() < size) {
        text += "All happy families are alike; line " + std::to_string(text.size()) + ".\n";
    }
    text.resize(size);
    std::ofstream(file, std::ios_base::binary) << text;
}

// Where the server started by `server` listens, which it writes into a file of `folder`.
std::string urlOf(const host::ChildProcess& server, const std::filesystem::path& folder) {
    const auto file = folder / ("nats-server_" + std::to_string(server.id()) + ".ports");
    for (int i = 0; i < 1000; ++i) {
        const std::string text = contentOf(file);
        const std::size_t start = text.find("nats://");
        if (start != std::string::npos && text.find('}') != std::string::npos) {
            return text.substr(start, text.find('"', start) - start);
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    throw std::runtime_error("nats-server does not start");
}

void measureAll(const std::filesystem::path& folder, const std::filesystem::path& self,
                int repetitions) {
    std::ofstream(folder / "server.conf")
        << "listen: \"127.0.0.1:-1\"\nports_file_dir: \"" << folder.string()
        << "\"\nmax_payload: 64MB\nmax_pending: 256MB\n";
    const host::ChildProcess server("/usr/sbin/nats-server",
                                    {"-c", folder / "server.conf", "-l", folder / "log"});
    const std::string url = urlOf(server, folder);
    std::vector<Input> inputs = {
        {"small read", folder / "small.txt", 0, std::chrono::milliseconds(2000)},
        {"read of 10 MB", folder / "large.txt", 0, std::chrono::milliseconds(3000)}};
    writeText(inputs[0].file, 200);
    writeText(inputs[1].file, 10'000'000);

    std::vector<std::unique_ptr<host::ChildProcess>> workers;
    const auto start = [&](const std::vector<std::string>& arguments) {
        for (std::size_t i = 0; i < workerCount; ++i) {
            workers.push_back(std::make_unique<host::ChildProcess>(self, arguments));
        }
    };
    start({"bundle", url, SERIALIZATION_BUNDLE});
    std::vector<std::unique_ptr<Client>> clients;
    for (std::size_t i = 0; i < clientCount; ++i) {
        clients.push_back(std::make_unique<Client>(url, "client" + std::to_string(i)));
    }
    std::vector<std::string> echo = {"echo", url};
    std::vector<std::string> bus = {"bus", url};
    for (Input& input : inputs) {
        const std::string request = requestFor(clients[0]->id(), input.file);
        warmUp(*clients[0], readRequestChannel, request);
        const std::string answer = clients[0]->ask(readRequestChannel, request);
        input.answerSize = answer.size();
        const std::filesystem::path file = input.file.string() + ".answer";
        std::ofstream(file, std::ios_base::binary) << answer;
        echo.push_back("echo/" + input.file.stem().string() + "=" + file.string());
        bus.push_back("bus/" + input.file.stem().string() + "=" + file.string());
    }
    start(echo);
    start(bus);
    std::string separator;
    std::cout << "{\"benchmarks\":[\n";
    for (const Input& input : inputs) {
        const std::string stem = input.file.stem();
        for (const std::string kind : {"echo/", "bus/"}) {
            warmUp(*clients[0], kind + stem, requestFor(clients[0]->id(), input.file));
        }
        for (int i = 0; i < repetitions; ++i) {
            measure(clients, "echo/" + stem, input, "echo", separator);
            measure(clients, "bus/" + stem, input, "echo on the bus", separator);
            measure(clients, readRequestChannel, input, "bundle", separator);
        }
    }
    std::cout << "\n]}\n";
}

}  // namespace

int main(int argc, char** argv) {
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    try {
        if (arguments.size() > 2 && arguments[0] == "echo") {
            runEcho(arguments[1], answersOf({arguments.begin() + 2, arguments.end()}));
        }
        if (arguments.size() > 2 && arguments[0] == "bus") {
            runBusEcho(arguments[1], answersOf({arguments.begin() + 2, arguments.end()}));
        }
        if (arguments.size() == 3 && arguments[0] == "bundle") {
            runBundle(arguments[1], arguments[2]);
        }
        const test::TemporaryDirectory folder;
        measureAll(folder.path(), std::filesystem::read_symlink("/proc/self/exe"),
                   arguments.empty() ? 3 : std::stoi(arguments[0]));
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "nats_benchmark: " << error.what() << '\n';
        return 1;
    }
}
