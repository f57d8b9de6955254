// SPDX-License-Identifier: Apache-2.0
#include "host/standard_streams.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <vector>

#include "platform/posix/system_error.h"

namespace host {

namespace {

using platform::throwSystemError;

void waitUntilReady(int fd, short events) {
    pollfd waited{fd, events, 0};
    if (::poll(&waited, 1, -1) < 0 && errno != EINTR) {
        throwSystemError("cannot wait for a standard stream");
    }
}

// True when the call that just failed should be repeated; waits until that makes sense.
bool shallRetry(int fd, short events) {
    if (errno == EINTR) {
        return true;
    }
    if (errno == EAGAIN || errno == EWOULDBLOCK) {
        // The program's parent shares the stream and has made it non-blocking.
        waitUntilReady(fd, events);
        return true;
    }
    return false;
}

// Drops the first `count` bytes of `pieces` from `first` on; returns the first piece that has bytes
// left.
std::size_t skipWritten(std::vector<iovec>& pieces, std::size_t first, std::size_t count) {
    while (first < pieces.size() && count >= pieces[first].iov_len) {
        count -= pieces[first].iov_len;
        ++first;
    }
    if (first < pieces.size()) {
        pieces[first].iov_base = static_cast<char*>(pieces[first].iov_base) + count;
        pieces[first].iov_len -= count;
    }
    return first;
}

}  // namespace

void openMissingStandardStreams() {
    for (int fd = 0; fd <= 2; ++fd) {
        if (::fcntl(fd, F_GETFD) >= 0) {
            continue;
        }
        // The system gives out the lowest free number, which is `fd`: those below it are open. It
        // is opened for the other direction, so that using the stream is an error: a missing input
        // is not an empty document, and an answer without a reader is not delivered.
        if (::open("/dev/null", fd == STDIN_FILENO ? O_WRONLY : O_RDONLY) < 0) {
            throwSystemError("cannot open /dev/null");
        }
    }
}

platform::FileDescriptor divertStandardOutput() {
    platform::FileDescriptor output(::fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, 3));
    if (output.get() < 0 || ::dup2(STDERR_FILENO, STDOUT_FILENO) < 0) {
        throwSystemError("cannot set up the standard output");
    }
    return output;
}

void writeAll(int fd, std::initializer_list<std::string_view> pieces) {
    std::vector<iovec> rest;
    rest.reserve(pieces.size());
    for (std::string_view piece : pieces) {
        rest.push_back({const_cast<char*>(piece.data()), piece.size()});
    }
    std::size_t first = skipWritten(rest, 0, 0);
    while (first < rest.size()) {
        const ssize_t written = ::writev(fd, &rest[first], static_cast<int>(rest.size() - first));
        if (written >= 0) {
            first = skipWritten(rest, first, static_cast<std::size_t>(written));
        } else if (!shallRetry(fd, POLLOUT)) {
            constexpr const char* what = "cannot write to the standard output";
            if (errno == EPIPE) {
                throw ReaderGone(errno, std::generic_category(), what);
            }
            throwSystemError(what);
        }
    }
}

std::size_t readSome(int fd, char* to, std::size_t room) {
    for (;;) {
        const ssize_t count = ::read(fd, to, room);
        if (count >= 0) {
            return static_cast<std::size_t>(count);
        }
        if (!shallRetry(fd, POLLIN)) {
            throwSystemError("cannot read the standard input");
        }
    }
}

}  // namespace host
