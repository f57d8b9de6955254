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

void logError(std::string_view callback, std::string_view channel, std::string_view reason) {
    logger().error("The {} of channel \"{}\" failed: {}", callback, channel, reason);
}

}  // namespace

spdlog::logger& logger() {
    // Never destroyed: delivery threads may outlive the static objects of a process that exits.
    static const auto& instance = *new std::shared_ptr<spdlog::logger>(findOrCreateLogger());
    return *instance;
}

void logFailure(std::string_view callback, std::string_view channel) noexcept {
    try {
        try {
            throw;
        } catch (const std::exception& exception) {
            logError(callback, channel, exception.what());
        } catch (...) {
            logError(callback, channel, "an exception that is not derived from std::exception");
        }
    } catch (...) {
        // A failure to log must not end the process.
    }
}

}  // namespace platform::messaging
