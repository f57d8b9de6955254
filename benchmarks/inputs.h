// SPDX-License-Identifier: Apache-2.0
// The generated inputs of the benchmarks.
#pragma once

#include <fstream>
#include <sstream>
#include <stdexcept>
#include <string>

namespace benchmarks {

/// The bytes of the generated file `name`.
inline std::string input(const std::string& name) {
    const std::string path = std::string(BENCHMARK_INPUTS "/") + name;
    std::ifstream file(path, std::ios::binary);
    if (!file)
        throw std::runtime_error("cannot read " + path);
    return (std::ostringstream() << file.rdbuf()).str();
}

}  // namespace benchmarks
