// SPDX-License-Identifier: Apache-2.0
#include "tests/serialization/activator/elf_file.h"

#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace test {
namespace {

template <typename Record>
std::vector<Record> records(std::string_view bytes) {
    std::vector<Record> result(bytes.size() / sizeof(Record));
    std::memcpy(result.data(), bytes.data(), result.size() * sizeof(Record));
    return result;
}

std::string_view textAt(std::string_view strings, std::size_t offset) {
    const std::string_view rest = strings.substr(offset);
    return rest.substr(0, rest.find('\0'));
}

}  // namespace

ElfFile::ElfFile(const std::filesystem::path& path) {
    std::ostringstream content;
    content << std::ifstream(path, std::ios::binary).rdbuf();
    bytes_ = content.str();
    if (bytes_.size() < sizeof(Elf64_Ehdr) || !bytes_.starts_with(ELFMAG)) {
        throw std::runtime_error(path.string() + " is no ELF file");
    }
}

Elf64_Shdr ElfFile::section(std::string_view name) const {
    Elf64_Ehdr header;
    std::memcpy(&header, bytes_.data(), sizeof header);
    const std::vector<Elf64_Shdr> all = sections();
    const std::string_view names = content(all.at(header.e_shstrndx));
    for (const Elf64_Shdr& section : all) {
        if (textAt(names, section.sh_name) == name) {
            return section;
        }
    }
    throw std::runtime_error("no section " + std::string(name));
}

std::string_view ElfFile::content(const Elf64_Shdr& section) const {
    return std::string_view(bytes_).substr(section.sh_offset, section.sh_size);
}

std::vector<ElfSymbol> ElfFile::dynamicSymbols() const {
    const std::string_view names = content(section(".dynstr"));
    std::vector<ElfSymbol> result;
    for (const Elf64_Sym& symbol : records<Elf64_Sym>(content(section(".dynsym")))) {
        if (symbol.st_name != 0) {
            result.push_back(
                {std::string(textAt(names, symbol.st_name)), symbol.st_shndx != SHN_UNDEF});
        }
    }
    return result;
}

std::vector<Elf64_Shdr> ElfFile::sections() const {
    Elf64_Ehdr header;
    std::memcpy(&header, bytes_.data(), sizeof header);
    return records<Elf64_Shdr>(std::string_view(bytes_).substr(
        header.e_shoff, std::size_t{header.e_shnum} * sizeof(Elf64_Shdr)));
}

}  // namespace test
