// SPDX-License-Identifier: Apache-2.0
// A folder for the files that a benchmark writes.
#pragma once

#include <unistd.h>

#include <filesystem>
#include <string>
#include <string_view>

namespace benchmarks {

/// A new folder, gone with the object: in memory where the system has such a file system, so that
/// it is programs that are measured and not a disk.
class ScratchFolder {
public:
    ScratchFolder() {
        const bool inMemory = std::filesystem::is_directory("/dev/shm");
        folder_ = (inMemory ? "/dev/shm" : std::filesystem::temp_directory_path()) /
                  ("benchmark." + std::to_string(::getpid()));
        std::filesystem::create_directory(folder_);
    }
    ScratchFolder(const ScratchFolder&) = delete;
    ScratchFolder& operator=(const ScratchFolder&) = delete;
    ~ScratchFolder() {
        std::error_code failed;
        std::filesystem::remove_all(folder_, failed);
    }

    std::string operator/(std::string_view name) const { return folder_ / name; }

private:
    std::filesystem::path folder_;
};

}  // namespace benchmarks
