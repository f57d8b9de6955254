// SPDX-License-Identifier: Apache-2.0
// Shows a user at a terminal that the program is at work.
#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>

namespace host {

/// A line at the end of the terminal on standard error, which says what is being done and since
/// when. It appears when the work has taken a second; without a terminal there is none.
class Progress {
public:
    /// `work` as for `tell`.
    explicit Progress(std::string work);

    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    /// Removes the line.
    ~Progress();

    /// What is being done now, such as "reading file 3 of 20": no longer than a terminal is wide.
    void tell(std::string work);

    /// Removes the line until it changes the next time, so that something else can be printed.
    void clear();

private:
    void show();

    const std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
    std::mutex mutex_;
    std::condition_variable changed_;
    std::string work_;       // guarded by mutex_
    bool isShown_ = false;   // guarded by mutex_
    bool hasEnded_ = false;  // guarded by mutex_
    std::thread thread_;     // none without a terminal
};

}  // namespace host
