#pragma once

#include <elf.h>
#include <cstdint>
#include <cstring>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch::Testing {

/// What a 64-bit shared object says of itself. Throws std::runtime_error for any other file.
class ElfFile {
public:
    explicit ElfFile(const std::string& name) {
        std::ifstream stream(name, std::ios::binary);
        bytes_.assign(std::istreambuf_iterator<char>(stream), {});
        const auto header = at<Elf64_Ehdr>(0);
        if (std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0 ||
            header.e_ident[EI_CLASS] != ELFCLASS64) {
            throw std::runtime_error(name + " is no 64-bit ELF file");
        }
        for (std::size_t i = 0; i < header.e_shnum; ++i) {
            sections_.push_back(at<Elf64_Shdr>(header.e_shoff + i * header.e_shentsize));
        }
    }

    /// Names of what others can find in it.
    [[nodiscard]] std::vector<std::string> exportedSymbols() const {
        std::vector<std::string> names;
        forEach<Elf64_Sym>(SHT_DYNSYM, [&](const Elf64_Shdr& section, const Elf64_Sym& symbol) {
            const auto bind = ELF64_ST_BIND(symbol.st_info);
            if (symbol.st_shndx == SHN_UNDEF || bind == STB_LOCAL) return;
            const Elf64_Shdr& strings = sections_.at(section.sh_link);
            names.emplace_back(&bytes_.at(strings.sh_offset + symbol.st_name));
        });
        return names;
    }

    /// Whether it was linked with -z nodelete.
    [[nodiscard]] bool staysMapped() const {
        bool stays = false;
        forEach<Elf64_Dyn>(SHT_DYNAMIC, [&](const Elf64_Shdr&, const Elf64_Dyn& entry) {
            stays = stays || (entry.d_tag == DT_FLAGS_1 && (entry.d_un.d_val & DF_1_NODELETE) != 0);
        });
        return stays;
    }

private:
    template <typename Record>
    [[nodiscard]] Record at(std::size_t offset) const {
        if (offset + sizeof(Record) > bytes_.size()) throw std::runtime_error("a cut-off ELF file");
        Record record;
        std::memcpy(&record, bytes_.data() + offset, sizeof record);
        return record;
    }
    template <typename Record, typename Visit>
    void forEach(std::uint32_t type, const Visit& visit) const {
        for (const Elf64_Shdr& section : sections_) {
            if (section.sh_type != type) continue;
            for (std::size_t at_ = 0; at_ + sizeof(Record) <= section.sh_size;
                 at_ += sizeof(Record)) {
                visit(section, at<Record>(section.sh_offset + at_));
            }
        }
    }

    std::vector<char> bytes_;
    std::vector<Elf64_Shdr> sections_;
};

}  // namespace VexaTouch::Testing
