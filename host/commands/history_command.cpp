// SPDX-License-Identifier: Apache-2.0
#include "host/commands/history_command.h"

#include <unistd.h>

#include <array>
#include <cstdint>
#include <ctime>
#include <stdexcept>
#include <vector>

#include "host/commands/read_command.h"
#include "host/exit_status.h"
#include "host/standard_streams.h"
#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

std::string inUtc(std::int64_t milliseconds) {
    const auto seconds = static_cast<std::time_t>(milliseconds / 1000);
    std::tm time{};
    std::array<char, 32> text{};
    ::gmtime_r(&seconds, &time);
    std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &time);
    return text.data();
}

void list(const std::vector<EarlierVersion>& versions, int output) {
    std::string lines;
    for (std::size_t i = 0; i < versions.size(); ++i) {
        lines += std::to_string(i + 1) + "\t" + inUtc(versions[i].time) + "\t" +
                 std::to_string(versions[i].size) + "\n";
    }
    writeAll(output, {lines});
}

}  // namespace

int runHistory(const HistoryCommandOptions& options, int output) {
    const Guard guard = makeGuard(options.guard, {});
    if (!guard.history) {
        throw std::runtime_error("there are no earlier versions without a folder for them");
    }
    const std::string document = History::nameOf(options.file);
    const std::vector<EarlierVersion> versions = guard.history->versionsOf(document);
    const std::size_t number = options.shown != 0 ? options.shown : options.restored;
    if (number == 0) {
        list(versions, output);
        return exitDone;
    }
    if (number > versions.size()) {
        throw std::runtime_error(options.file + " has " + std::to_string(versions.size()) +
                                 " earlier versions");
    }
    const platform::FileDescriptor version =
        guard.history->open(document, versions[number - 1].time);
    if (options.restored != 0) {
        guard.saves->restore(options.file, version.get());
        return exitDone;
    }
    ReadOptions read;
    read.bundle = options.bundle;
    read.contentType = options.contentType;
    read.files = {"/proc/self/fd/" + std::to_string(version.get())};
    return runRead(read, STDIN_FILENO, output);
}

}  // namespace host
