// Reads which initialisers a library or program has and whose they are.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STARTUP_SYMBOLS_H
#define KEL_TESTS_STARTUP_SYMBOLS_H

#include <elf.h>
#include <link.h>

#include <cstdint>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace kel {
namespace test {

// The units of the library that have an initialiser, in the order in which these run.
inline std::vector<std::string> initialised_units() {
    return {"vdlogger.cpp",     "resource.cpp", "arg_list.cpp", "unique_id.cpp", "environment.cpp",
            "offset_table.cpp", "strings.cpp",  "istream.cpp",  "standard.cpp",  "exception.cpp",
            "load_library.cpp", "portable.cpp", "pipe.cpp",     "vthread.cpp",   "base_util.cpp"};
}

struct Function {
    std::string unit;  // the source file's name without its folder
    std::string name;
};

// The symbol table of a file. Local symbols follow the name of their source file.
class Symbols {
public:
    explicit Symbols(const std::string& path) {
        std::ifstream file(path, std::ios::binary);
        _bytes.assign(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
    }

    Function function_at(ElfW(Addr) offset) const {
        const ElfW(Shdr)* const symbols = section(SHT_SYMTAB);
        if (symbols == nullptr) return {"no symbol table", ""};
        const auto& header = at<ElfW(Ehdr)>(0);
        return find(*symbols, at<ElfW(Shdr)>(header.e_shoff + symbols->sh_link * sizeof(ElfW(Shdr))), offset);
    }

    // The initialisers as they stand in the file, which is where they are in a program of fixed addresses.
    std::vector<ElfW(Addr)> initialisers() const {
        const ElfW(Shdr)* const array = section(SHT_INIT_ARRAY);
        std::vector<ElfW(Addr)> addresses;
        for (std::size_t n = 0; array != nullptr && n < array->sh_size / sizeof(ElfW(Addr)); ++n) {
            addresses.push_back(at<ElfW(Addr)>(array->sh_offset + n * sizeof(ElfW(Addr))));
        }
        return addresses;
    }

private:
    template <class T>
    const T& at(std::size_t offset) const {
        return *reinterpret_cast<const T*>(_bytes.data() + offset);
    }

    const ElfW(Shdr) * section(std::uint32_t type) const {
        const auto& header = at<ElfW(Ehdr)>(0);
        for (int i = 0; i < header.e_shnum; ++i) {
            const auto& found = at<ElfW(Shdr)>(header.e_shoff + i * sizeof(ElfW(Shdr)));
            if (found.sh_type == type) return &found;
        }
        return nullptr;
    }

    Function find(const ElfW(Shdr) & symbols, const ElfW(Shdr) & strings, ElfW(Addr) offset) const {
        std::string unit;
        for (std::size_t n = 0; n < symbols.sh_size / sizeof(ElfW(Sym)); ++n) {
            const auto& symbol = at<ElfW(Sym)>(symbols.sh_offset + n * sizeof(ElfW(Sym)));
            const std::string name(_bytes.data() + strings.sh_offset + symbol.st_name);
            const int type = symbol.st_info & 0xf;
            if (type == STT_FILE) unit = name.substr(name.rfind('/') + 1);
            if (type == STT_FUNC && symbol.st_value == offset) return {unit, name};
        }
        return {"unknown", ""};
    }

    std::string _bytes;
};

// The compiler's own entries: the C runtime's, those of sanitizers and of coverage counters.
inline bool is_the_compilers(const Function& f) {
    return f.name == "frame_dummy" || f.name.find("module_ctor") != std::string::npos ||
           f.name.rfind("_sub_I_", 0) == 0 || f.name.rfind("__llvm_", 0) == 0;
}

}  // namespace test
}  // namespace kel

#endif
