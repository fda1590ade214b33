#include "tools/welcomer/plugins/LibrarySymbols.h"

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/SystemError.h"

#include <cerrno>
#include <fcntl.h>
#include <gelf.h>
#include <link.h>
#include <memory>
#include <sys/stat.h>

namespace welcomer::tool {

namespace {

using ElfHandle = std::unique_ptr<Elf, int (*)(Elf*)>;

constexpr int kNativeClass = sizeof(void*) == 8 ? ELFCLASS64 : ELFCLASS32;

// The kind of machine that this program is built for.
int ownMachine() {
    const posix::FileDescriptor file(::open("/proc/self/exe", O_RDONLY | O_CLOEXEC));
    const ElfHandle own(elf_begin(file.get(), ELF_C_READ, nullptr), elf_end);
    GElf_Ehdr header = {};
    return own && gelf_getehdr(own.get(), &header) ? header.e_machine : EM_NONE;
}

std::string troubleWith(Elf* library) {
    GElf_Ehdr header = {};
    if (!library || elf_kind(library) != ELF_K_ELF || !gelf_getehdr(library, &header)) {
        return "it is no library";
    }
    if (header.e_ident[EI_CLASS] != kNativeClass || header.e_machine != ownMachine()) {
        return "it is built for another kind of machine";
    }
    return header.e_type == ET_DYN ? "" : "it is no shared library";
}

bool isExported(const GElf_Sym& symbol) {
    const auto binding = GELF_ST_BIND(symbol.st_info);
    const auto visibility = GELF_ST_VISIBILITY(symbol.st_other);
    return symbol.st_shndx != SHN_UNDEF && binding != STB_LOCAL &&
           (visibility == STV_DEFAULT || visibility == STV_PROTECTED);
}

const char* textAt(Elf* library, const GElf_Shdr& section, std::size_t offset) {
    const char* const text = elf_strptr(library, section.sh_link, offset);
    return text ? text : "";
}

void readSymbols(Elf* library, Elf_Data* data, const GElf_Shdr& section, LibrarySymbols& symbols) {
    GElf_Sym symbol = {};
    for (int index = 1; gelf_getsym(data, index, &symbol); ++index) {
        const char* const name = textAt(library, section, symbol.st_name);
        if (*name != '\0' && isExported(symbol)) {
            symbols.exported.push_back({name, GELF_ST_BIND(symbol.st_info) == STB_GNU_UNIQUE});
        }
    }
}

void readNeeded(Elf* library, Elf_Data* data, const GElf_Shdr& section, LibrarySymbols& symbols) {
    GElf_Dyn entry = {};
    for (int index = 0; gelf_getdyn(data, index, &entry) && entry.d_tag != DT_NULL; ++index) {
        if (entry.d_tag == DT_NEEDED) {
            symbols.needed.emplace_back(textAt(library, section, entry.d_un.d_val));
        }
    }
}

} // namespace

LibrarySymbols readLibrarySymbols(const std::filesystem::path& file) {
    const posix::FileDescriptor descriptor(
        ::open(file.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    struct stat status = {};
    if (!descriptor || ::fstat(descriptor.get(), &status) != 0) {
        return {{}, {}, posix::systemError("it cannot be read", errno).message};
    }
    if (!S_ISREG(status.st_mode)) {
        return {{}, {}, "it is no regular file"};
    }
    elf_version(EV_CURRENT);
    const ElfHandle library(elf_begin(descriptor.get(), ELF_C_READ, nullptr), elf_end);
    LibrarySymbols symbols;
    symbols.trouble = troubleWith(library.get());
    for (Elf_Scn* each = nullptr; symbols.trouble.empty() && (each = elf_nextscn(library.get(), each));) {
        GElf_Shdr section = {};
        Elf_Data* const data = gelf_getshdr(each, &section) ? elf_getdata(each, nullptr) : nullptr;
        if (data && section.sh_type == SHT_DYNSYM) {
            readSymbols(library.get(), data, section, symbols);
        } else if (data && section.sh_type == SHT_DYNAMIC) {
            readNeeded(library.get(), data, section, symbols);
        }
    }
    return symbols;
}

} // namespace welcomer::tool
