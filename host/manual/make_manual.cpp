// SPDX-License-Identifier: Apache-2.0
// A program of the build: writes the manual page and the completions of serialization_host.
//
//     make_manual FOLDER

#include <exception>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <stdexcept>
#include <string>
#include <vector>

#include "host/manual/described_program.h"
#include "host/manual/manual.h"

namespace {

void save(const std::filesystem::path& file, const std::string& text) {
    std::ofstream stream(file, std::ios_base::binary);
    stream << text;
    stream.close();
    if (!stream) {
        throw std::runtime_error("cannot write " + file.string());
    }
}

}  // namespace

int main(int argc, char** argv) {
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    try {
        const std::filesystem::path folder = arguments.at(0);
        const host::DescribedProgram program = host::describedProgram();
        save(folder / "serialization_host.1", host::manualPage(program));
        save(folder / "serialization_host.bash", host::bashCompletion(program));
        save(folder / "serialization_host.zsh", host::zshCompletion(program));
        save(folder / "serialization_host.fish", host::fishCompletion(program));
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "make_manual: " << error.what() << "\n";
        return 1;
    }
}
