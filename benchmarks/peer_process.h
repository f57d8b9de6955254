// SPDX-License-Identifier: Apache-2.0
// A program in another language that does the bundle's jobs on command and says how long each took.
#pragma once

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include <sys/types.h>

namespace benchmarks {

/// Runs as long as the object lives. Its start-up is no part of any measurement.
class PeerProcess {
public:
    /// Starts `arguments`, a program that is searched for in the PATH. A program that cannot be
    /// started fails every command.
    explicit PeerProcess(const std::vector<std::string>& arguments);
    PeerProcess(const PeerProcess&) = delete;
    PeerProcess& operator=(const PeerProcess&) = delete;
    ~PeerProcess();

    /// The seconds that the command of these words took. Throws std::runtime_error with the peer's
    /// own words when it failed, and when the peer does not run.
    double run(const std::vector<std::string>& words);

private:
    struct Close {
        void operator()(std::FILE* file) const { std::fclose(file); }
    };

    std::string name_;
    pid_t process_ = -1;
    std::unique_ptr<std::FILE, Close> commands_;
    std::unique_ptr<std::FILE, Close> answers_;
};

}  // namespace benchmarks
