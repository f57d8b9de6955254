// SPDX-License-Identifier: Apache-2.0
// Logging goes through spdlog, whose registry the host shares with this library.
#include "platform/messaging/log.h"

#include <spdlog/logger.h>
#include <spdlog/sinks/stdout_sinks.h>
#include <spdlog/spdlog.h>

#include <exception>
#include <memory>

namespace platform::messaging {
namespace {

std::shared_ptr<spdlog::logger> findOrCreateLogger() {
    auto logger = spdlog::get("messaging");
    return logger ? logger : spdlog::stderr_logger_mt("messaging");
}

// Calls `log` with the text of the exception that is being handled.
template <typename Log>
void withReason(Log log) noexcept {
    try {
        try {
            throw;
        } catch (const std::exception& exception) {
            log(exception.what());
        } catch (...) {
            log("an exception that is not derived from std::exception");
        }
    } catch (...) {
        // A failure to log must not end the process.
    }
}

}  // namespace

spdlog::logger& logger() {
    // Never destroyed: delivery threads may outlive the static objects of a process that exits.
    static const auto& instance = *new std::shared_ptr<spdlog::logger>(findOrCreateLogger());
    return *instance;
}

void logFailure(std::string_view callback, std::string_view channel) noexcept {
    withReason([&](std::string_view reason) {
        logger().error("The {} of channel \"{}\" failed: {}", callback, channel, reason);
    });
}

void logLoss() noexcept {
    withReason([](std::string_view reason) { logger().error("A message is lost: {}", reason); });
}

}  // namespace platform::messaging
