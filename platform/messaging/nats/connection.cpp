// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/connection.h"

#include <openssl/crypto.h>

#include <algorithm>
#include <array>
#include <exception>
#include <limits>
#include <mutex>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/text/quoted.h"

namespace platform::messaging::nats {
namespace {

constexpr std::int64_t connectTimeout = 5'000;  // these are milliseconds

// Before the first server is tried again; a cluster's others are tried at once.
constexpr std::int64_t reconnectWait = 500;

// The connection to a server that stops answering is given up after a minute.
constexpr std::int64_t pingInterval = 20'000;
constexpr int unansweredPings = 2;

// The same for a server that stops reading: the time that a large document may take on a slow line.
constexpr std::int64_t writeDeadline = 60'000;

// libnats calls back with a bare pointer, from a thread of its own and at times after the
// connection is gone. So that pointer is in truth a number that is looked up.
struct Listeners {
    std::mutex mutex;  // guards what follows
    std::unordered_map<std::uintptr_t, std::weak_ptr<ConnectionEvents>> byNumber;
    std::uintptr_t last = 0;
};

// Never destroyed: libnats may call back while the process exits.
Listeners& listeners() {
    static Listeners& instance = *new Listeners();
    return instance;
}

std::shared_ptr<ConnectionEvents> find(void* number) {
    Listeners& all = listeners();
    const std::lock_guard lock(all.mutex);
    const auto found = all.byNumber.find(reinterpret_cast<std::uintptr_t>(number));
    return found != all.byNumber.end() ? found->second.lock() : nullptr;
}

std::string lastErrorOf(natsConnection* connection) {
    const char* text = nullptr;
    const natsStatus status = natsConnection_GetLastError(connection, &text);
    if (text != nullptr && *text != '\0') {
        return text::printable(text);
    }
    return status != NATS_OK ? natsStatus_GetText(status) : "the connection was cut";
}

// What `make` returns. An exception would go through libnats, which is C, and end the process; and
// that a connection is closed has to be heard of even when there is no memory to say why.
template <typename Make>
std::string textOf(Make make) noexcept {
    try {
        return make();
    } catch (const std::exception&) {
        return "out of memory";  // which needs none itself
    }
}

void onDisconnected(natsConnection* connection, void* number) {
    if (const auto events = find(number)) {
        events->onDisconnected(textOf([&] { return lastErrorOf(connection); }));
    }
}

void onReconnected(natsConnection* connection, void* number) {
    if (const auto events = find(number)) {
        events->onReconnected(textOf([&] { return serverOf(connection); }));
    }
}

void onClosed(natsConnection* connection, void* number) {
    if (const auto events = find(number)) {
        events->onClosed(textOf([&] { return lastErrorOf(connection); }));
    }
}

void onError(natsConnection* connection, natsSubscription* subscription, natsStatus status,
             void* number) {
    if (const auto events = find(number)) {
        const std::string reason = textOf([&] {
            const char* text = nats_GetLastError(nullptr);
            return text != nullptr && *text != '\0' ? text::printable(text)
                                                    : lastErrorOf(connection);
        });
        events->onError(status, reason, subscription);
    }
}

int clampToInt(std::size_t value) {
    return static_cast<int>(std::clamp<std::size_t>(value, 1, std::numeric_limits<int>::max()));
}

void setServers(natsOptions& made, const NatsOptions& options) {
    std::vector<const char*> urls;
    for (const std::string& url : options.servers) {
        urls.push_back(url.c_str());
    }
    check(natsOptions_SetServers(&made, urls.data(), static_cast<int>(urls.size())),
          "Cannot use the NATS servers " + withoutSecrets(options.servers));
}

void setCredentials(natsOptions& made, const NatsOptions& options) {
    if (!options.user.empty()) {
        check(natsOptions_SetUserInfo(&made, options.user.c_str(), options.password.c_str()),
              "Cannot use the NATS user");
    }
    if (!options.token.empty()) {
        check(natsOptions_SetToken(&made, options.token.c_str()), "Cannot use the NATS token");
    }
    if (!options.credentialsFile.empty()) {
        check(natsOptions_SetUserCredentialsFromFiles(&made, options.credentialsFile.c_str(),
                                                      nullptr),
              "Cannot use the credentials file " + options.credentialsFile);
    }
}

void setTls(natsOptions& made, const NatsOptions& options) {
    const NatsOptions::Tls& tls = options.tls;
    const bool asked =
        std::any_of(options.servers.begin(), options.servers.end(),
                    [](const std::string& url) { return url.starts_with("tls://"); });
    if (!tls.enabled && !asked) {
        return;
    }
    check(natsOptions_SetSecure(&made, true), "Cannot use TLS");
    if (!tls.caFile.empty()) {
        check(natsOptions_LoadCATrustedCertificates(&made, tls.caFile.c_str()),
              "Cannot use the certificate authorities in " + tls.caFile);
    }
    if (!tls.certificateFile.empty()) {
        check(natsOptions_LoadCertificatesChain(&made, tls.certificateFile.c_str(),
                                                tls.keyFile.c_str()),
              "Cannot use the certificate " + tls.certificateFile + " with the key " + tls.keyFile);
    }
}

void setBehaviour(natsOptions& made, const NatsOptions& options, const std::string& name) {
    const char* const failure = "Cannot set up the NATS connection";
    check(natsOptions_SetName(&made, name.c_str()), failure);
    check(natsOptions_SetTimeout(&made, connectTimeout), failure);
    check(natsOptions_SetMaxReconnect(&made, -1), failure);
    check(natsOptions_SetReconnectWait(&made, reconnectWait), failure);
    check(natsOptions_SetReconnectBufSize(&made, clampToInt(options.maxUnsentBytes)), failure);
    check(natsOptions_SetPingInterval(&made, pingInterval), failure);
    check(natsOptions_SetMaxPingsOut(&made, unansweredPings), failure);
    check(natsOptions_SetWriteDeadline(&made, writeDeadline), failure);
    // Otherwise a thread of libnats sends the buffered data a millisecond later.
    check(natsOptions_SetSendAsap(&made, true), failure);
}

void setCallbacks(natsOptions& made, std::uintptr_t listener) {
    const char* const failure = "Cannot set up the NATS connection";
    // NOLINTNEXTLINE(performance-no-int-to-ptr): never used as a pointer
    auto* const number = reinterpret_cast<void*>(listener);
    check(natsOptions_SetDisconnectedCB(&made, onDisconnected, number), failure);
    check(natsOptions_SetReconnectedCB(&made, onReconnected, number), failure);
    check(natsOptions_SetClosedCB(&made, onClosed, number), failure);
    check(natsOptions_SetErrorHandler(&made, onError, number), failure);
}

std::string withoutSecrets(std::string_view url) {
    const std::size_t scheme = url.find("://");
    const std::size_t start = scheme == std::string_view::npos ? 0 : scheme + 3;
    const std::size_t at = url.rfind('@');
    if (at == std::string_view::npos || at < start) {
        return std::string(url);
    }
    return std::string(url.substr(0, start)) + std::string(url.substr(at + 1));
}

// Threads of libnats release connections, and with them OpenSSL's objects, at any time, even while
// the process exits, when OpenSSL would have cleaned up already. Whoever initializes OpenSSL first
// can switch that off, so this has to come before libnats.
void keepOpenSslToTheEnd() {
    OPENSSL_init_crypto(OPENSSL_INIT_NO_ATEXIT, nullptr);
}

// A client with credentials signs what the server sends it. libnats 3.4 cannot send a signature
// that begins with a zero byte, as one in 256 does; the next attempt has another signature.
natsStatus connect(natsConnection*& connection, natsOptions& made, bool hasCredentials) {
    int attempts = hasCredentials ? 4 : 1;
    natsStatus status = NATS_OK;
    do {
        status = natsConnection_Connect(&connection, &made);
    } while (status == NATS_CONNECTION_AUTH_FAILED && --attempts > 0);
    return status;
}

// How long a server may take to show that nothing of a subscription is on its way any more.
constexpr std::int64_t releaseTimeout = 1'000;

}  // namespace

Connection::~Connection() {
    natsConnection_Destroy(connection_);
    for (natsSubscription* subscription : released_) {
        natsSubscription_Destroy(subscription);
    }
}

bool Connection::isClosed() const {
    return natsConnection_IsClosed(connection_);
}

bool Connection::isConnected() const {
    return natsConnection_Status(connection_) == NATS_CONN_STATUS_CONNECTED;
}

SubscriptionHandle Connection::own(natsSubscription* subscription) {
    return {subscription, [connection = shared_from_this()](natsSubscription* ended) {
                connection->release(ended);
            }};
}

// The thread of libnats 3.4 that reads from the server may still be using a subscription that has
// been unsubscribed, until it has read the answer to a later ping. Without an answer, the
// subscription is kept until one comes, or until that thread has ended.
void Connection::release(natsSubscription* subscription) {
    natsSubscription_Unsubscribe(subscription);
    std::vector<natsSubscription*> candidates;
    {
        const std::lock_guard lock(mutex_);
        released_.push_back(subscription);
        candidates = released_;
    }
    if (!isConnected() || natsConnection_FlushTimeout(connection_, releaseTimeout) != NATS_OK) {
        return;
    }
    for (natsSubscription* candidate : candidates) {
        {
            const std::lock_guard lock(mutex_);
            if (std::erase(released_, candidate) == 0) {
                continue;  // another thread has done it
            }
        }
        natsSubscription_Destroy(candidate);
    }
}

ConnectionHandle openConnection(const NatsOptions& options, const std::string& name,
                                std::uintptr_t listener) {
    keepOpenSslToTheEnd();
    natsOptions* created = nullptr;
    check(natsOptions_Create(&created), "Cannot set up the NATS connection");
    const OptionsHandle made(created);
    setServers(*made, options);
    setCredentials(*made, options);
    setTls(*made, options);
    setBehaviour(*made, options, name);
    setCallbacks(*made, listener);
    natsConnection* connection = nullptr;
    check(connect(connection, *made, !options.credentialsFile.empty()),
          "Cannot connect to NATS at " + withoutSecrets(options.servers));
    return std::make_shared<Connection>(connection);
}

std::string serverOf(natsConnection* connection) {
    std::array<char, 512> url{};
    natsConnection_GetConnectedUrl(connection, url.data(), url.size());
    return text::printable(withoutSecrets(std::string_view(url.data())));
}

std::string withoutSecrets(const std::vector<std::string>& urls) {
    std::string result;
    for (const std::string& url : urls) {
        result +=
            (result.empty() ? "" : ", ") + text::printable(withoutSecrets(std::string_view(url)));
    }
    return result;
}

std::uintptr_t listen(const std::weak_ptr<ConnectionEvents>& events) {
    Listeners& all = listeners();
    const std::lock_guard lock(all.mutex);
    all.byNumber.emplace(++all.last, events);
    return all.last;
}

void forget(std::uintptr_t listener) {
    Listeners& all = listeners();
    const std::lock_guard lock(all.mutex);
    all.byNumber.erase(listener);
}

}  // namespace platform::messaging::nats
