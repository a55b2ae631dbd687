// The built plug-in's dynamic interface, read from its ELF file: exactly the
// five entry points, its SONAME and its load-time dependencies.
#include <elf.h>
#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <vector>

namespace {

struct DynamicInterface {
    std::set<std::string> exported;  // defined global and weak symbols
    std::string soname;
    std::set<std::string> needed;
};

template <typename Ehdr, typename Shdr, typename Sym, typename Dyn, unsigned char (*Bind)(unsigned char)>
DynamicInterface Read(const std::vector<char>& file) {
    DynamicInterface result;
    auto at = [&](size_t offset) { return file.data() + offset; };
    const auto* header = reinterpret_cast<const Ehdr*>(at(0));
    const auto* sections = reinterpret_cast<const Shdr*>(at(header->e_shoff));
    for (size_t i = 0; i < header->e_shnum; ++i) {
        const Shdr& section = sections[i];
        const char* strings = at(sections[section.sh_link].sh_offset);
        if (section.sh_type == SHT_DYNSYM) {
            const auto* symbols = reinterpret_cast<const Sym*>(at(section.sh_offset));
            for (size_t k = 0; k < section.sh_size / sizeof(Sym); ++k) {
                unsigned char bind = Bind(symbols[k].st_info);
                if (symbols[k].st_shndx != SHN_UNDEF && (bind == STB_GLOBAL || bind == STB_WEAK))
                    result.exported.insert(strings + symbols[k].st_name);
            }
        } else if (section.sh_type == SHT_DYNAMIC) {
            const auto* entries = reinterpret_cast<const Dyn*>(at(section.sh_offset));
            for (size_t k = 0; k < section.sh_size / sizeof(Dyn) && entries[k].d_tag != DT_NULL; ++k) {
                if (entries[k].d_tag == DT_SONAME) result.soname = strings + entries[k].d_un.d_val;
                if (entries[k].d_tag == DT_NEEDED) result.needed.insert(strings + entries[k].d_un.d_val);
            }
        }
    }
    return result;
}

unsigned char Bind32(unsigned char info) { return ELF32_ST_BIND(info); }
unsigned char Bind64(unsigned char info) { return ELF64_ST_BIND(info); }

DynamicInterface ReadPlugin() {
    std::ifstream in(QEL_PLUGIN_PATH, std::ios::binary);
    std::vector<char> file((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    if (file.size() < EI_NIDENT) return {};
    if (file[EI_CLASS] == ELFCLASS32) return Read<Elf32_Ehdr, Elf32_Shdr, Elf32_Sym, Elf32_Dyn, Bind32>(file);
    return Read<Elf64_Ehdr, Elf64_Shdr, Elf64_Sym, Elf64_Dyn, Bind64>(file);
}

TEST(PluginExports, ExactlyTheFiveEntryPoints) {
    DynamicInterface plugin = ReadPlugin();
    EXPECT_EQ(plugin.exported, (std::set<std::string>{"qelsysapiInit", "qelsysapiRun", "qelsysapiFinalize",
                                                      "qelsysapiPause", "qelsysapiResume"}));
}

TEST(PluginExports, SonameAndLoadTimeDependencies) {
    DynamicInterface plugin = ReadPlugin();
    EXPECT_EQ(plugin.soname, "libqelsysapisvc.so.5");
    EXPECT_TRUE(plugin.needed.count("libwebhost_runtime.so.12"));
    EXPECT_TRUE(plugin.needed.count("libqelsysapi.so.5"));
}

}  // namespace
