#include "Tools/Validate/ExportedSymbols.h"

#include <elf.h>
#include <link.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

/// Reads records out of a file's bytes wherever they are said to stand.
class Image {
public:
    explicit Image(std::string bytes) : bytes_(std::move(bytes)) {}

    template <typename Record>
    [[nodiscard]] std::optional<Record> at(std::size_t offset) const {
        Record record{};
        if (offset > bytes_.size() || bytes_.size() - offset < sizeof record) {
            return std::nullopt;
        }
        std::memcpy(&record, bytes_.data() + offset, sizeof record);
        return record;
    }
    [[nodiscard]] std::string text(std::size_t offset) const {
        return offset < bytes_.size() ? std::string(bytes_.c_str() + offset) : std::string();
    }

private:
    std::string bytes_;
};

bool isOfTheLinker(std::string_view name) {
    static constexpr std::array<std::string_view, 5> kNames = {"_init", "_fini", "_edata", "_end",
                                                               "__bss_start"};
    return std::ranges::find(kNames, name) != kNames.end();
}

bool isExported(const ElfW(Sym) & symbol) {
    // ELF32_ST_BIND is the same for both sizes.
    const unsigned binding = ELF32_ST_BIND(symbol.st_info);
    const unsigned visibility = ELF32_ST_VISIBILITY(symbol.st_other);
    return symbol.st_shndx != SHN_UNDEF && binding != STB_LOCAL &&
           (visibility == STV_DEFAULT || visibility == STV_PROTECTED);
}

}  // namespace

std::optional<std::vector<std::string>> exportedSymbols(const std::string& path) {
    std::ifstream stream(path, std::ios::binary);
    const Image file(std::string{std::istreambuf_iterator<char>(stream), {}});
    const auto header = file.at<ElfW(Ehdr)>(0);
    if (!header || std::memcmp(header->e_ident, ELFMAG, SELFMAG) != 0) {
        return std::nullopt;
    }
    const auto section = [&](std::size_t index) {
        return file.at<ElfW(Shdr)>(header->e_shoff + index * sizeof(ElfW(Shdr)));
    };
    for (std::size_t index = 0; index < header->e_shnum; ++index) {
        const auto symbols = section(index);
        if (!symbols || symbols->sh_type != SHT_DYNSYM) {
            continue;
        }
        const auto names = section(symbols->sh_link);
        if (!names) {
            break;
        }
        std::vector<std::string> exported;
        for (std::size_t at = 0; at < symbols->sh_size; at += sizeof(ElfW(Sym))) {
            const auto symbol = file.at<ElfW(Sym)>(symbols->sh_offset + at);
            if (!symbol) {
                return std::nullopt;
            }
            std::string name = file.text(names->sh_offset + symbol->st_name);
            if (isExported(*symbol) && !isOfTheLinker(name)) {
                exported.push_back(std::move(name));
            }
        }
        std::ranges::sort(exported);
        return exported;
    }
    return std::nullopt;
}

}  // namespace VexaTouch::Tools
