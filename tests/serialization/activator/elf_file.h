// SPDX-License-Identifier: Apache-2.0
// A shared library's file as a linker sees it: its sections and its dynamic symbols. For 64-bit
// files of the byte order of this machine.
#pragma once

#include <elf.h>

#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

namespace test {

struct ElfSymbol {
    std::string name;
    bool defined;
};

class ElfFile {
public:
    /// Throws std::runtime_error when `path` is no ELF file.
    explicit ElfFile(const std::filesystem::path& path);

    /// The header of the section `name`. Throws std::runtime_error when there is none.
    Elf64_Shdr section(std::string_view name) const;

    /// The section's bytes. Valid as long as the object.
    std::string_view content(const Elf64_Shdr& section) const;

    /// What the library gives to others and takes from them.
    std::vector<ElfSymbol> dynamicSymbols() const;

private:
    std::vector<Elf64_Shdr> sections() const;

    std::string bytes_;
};

}  // namespace test
