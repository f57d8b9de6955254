// SPDX-License-Identifier: Apache-2.0
#include "host/commands/stop_signals.h"

#include <poll.h>
#include <signal.h>
#include <spdlog/spdlog.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <system_error>
#include <utility>

#include "host/exit_status.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

sigset_t stopSignals() {
    sigset_t signals;
    ::sigemptyset(&signals);
    ::sigaddset(&signals, SIGTERM);
    ::sigaddset(&signals, SIGINT);
    return signals;
}

}  // namespace

void blockStopSignals() {
    const sigset_t signals = stopSignals();
    if (const int error = ::pthread_sigmask(SIG_BLOCK, &signals, nullptr); error != 0) {
        throw std::system_error(error, std::generic_category(), "cannot block signals");
    }
}

StopSignals::StopSignals(std::function<void()> abandon) : abandon_(std::move(abandon)) {
    const sigset_t signals = stopSignals();
    signals_ = platform::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC));
    if (!signals_) {
        platform::throwSystemError("cannot wait for signals");
    }
    thread_ = std::thread(&StopSignals::take, this);
}

StopSignals::~StopSignals() {
    end_.set();
    thread_.join();
}

void StopSignals::take() {
    bool isFirst = true;
    std::array<pollfd, 2> waited{{{signals_.get(), POLLIN, 0}, {end_.descriptor(), POLLIN, 0}}};
    for (;;) {
        if (::poll(waited.data(), waited.size(), -1) < 0) {
            continue;
        }
        if (waited[1].revents != 0) {
            return;
        }
        signalfd_siginfo signal{};
        if (::read(signals_.get(), &signal, sizeof signal) != sizeof signal) {
            continue;
        }
        if (!std::exchange(isFirst, false)) {
            abandon_();
            std::_Exit(exitRequestFailed);
        }
        spdlog::info("ending, as asked to by signal {}; another one ends the program at once",
                     signal.ssi_signo);
        whenFirst_.set_value();
        came_.set();
    }
}

}  // namespace host
