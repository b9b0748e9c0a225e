// libgpod and GLib stay out of the requests that do not read the iPod: the CGI does not need them
// at start (its ELF needed list), and an "avoid_timeout" request does not load them (the dynamic
// loader's own account, LD_DEBUG). The plugin that does need them is checked the same way, so
// that the checks are seen to find what they look for.
#include <elf.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/plugin/Plugin.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"

using namespace harmona::test;

namespace {

// The DT_NEEDED entries of a 64-bit little-endian ELF file, read from its section headers; throws
// on anything that is not such a file, so that a broken reader cannot pass silently.
std::vector<std::string> NeededLibraries(const std::string& path) {
    const std::string file = ReadFile(path);
    auto fail = [&](const char* why) { throw std::runtime_error(path + ": " + why); };
    if (file.size() < sizeof(Elf64_Ehdr))
        fail("too short");
    const auto* header = reinterpret_cast<const Elf64_Ehdr*>(file.data());
    if (std::string(reinterpret_cast<const char*>(header->e_ident), 4) != ELFMAG ||
        header->e_ident[EI_CLASS] != ELFCLASS64 || header->e_ident[EI_DATA] != ELFDATA2LSB)
        fail("not a 64-bit little-endian ELF file");
    auto section = [&](std::size_t index) {
        const std::size_t offset = header->e_shoff + index * header->e_shentsize;
        if (index >= header->e_shnum || offset + sizeof(Elf64_Shdr) > file.size())
            fail("section header out of the file");
        return reinterpret_cast<const Elf64_Shdr*>(file.data() + offset);
    };
    std::vector<std::string> needed;
    bool foundDynamic = false;
    for (std::size_t i = 0; i < header->e_shnum; ++i) {
        const Elf64_Shdr* dynamic = section(i);
        if (dynamic->sh_type != SHT_DYNAMIC)
            continue;
        foundDynamic = true;
        const Elf64_Shdr* strings = section(dynamic->sh_link);
        if (dynamic->sh_offset + dynamic->sh_size > file.size() ||
            strings->sh_offset + strings->sh_size > file.size())
            fail("dynamic section out of the file");
        const auto* entry = reinterpret_cast<const Elf64_Dyn*>(file.data() + dynamic->sh_offset);
        for (std::size_t n = 0; n < dynamic->sh_size / sizeof(Elf64_Dyn); ++n, ++entry) {
            if (entry->d_tag != DT_NEEDED)
                continue;
            if (entry->d_un.d_val >= strings->sh_size)
                fail("name out of the string table");
            needed.emplace_back(file.data() + strings->sh_offset + entry->d_un.d_val);
        }
    }
    if (!foundDynamic)
        fail("no dynamic section");
    return needed;
}

bool NeedsLibraryLike(const std::vector<std::string>& needed, const std::string& stem) {
    for (const std::string& name : needed)
        if (name.rfind(stem, 0) == 0)
            return true;
    return false;
}

const char* const kHeavyLibraries[] = {"libgpod",       "libglib-2.0",      "libgobject-2.0",
                                       "libgdk_pixbuf", "libimobiledevice", "libplist"};

TEST(IPodLoading, TheCgiDoesNotNeedLibgpodOrGlib) {
    const std::vector<std::string> needed = NeededLibraries(CgiProgram());
    ASSERT_TRUE(NeedsLibraryLike(needed, "libc.so")) << "the reader sees the needed list";
    for (const char* heavy : kHeavyLibraries)
        EXPECT_FALSE(NeedsLibraryLike(needed, heavy)) << heavy;
}

TEST(IPodLoading, ThePluginIsWhereLibgpodIsNeeded) {
    const std::vector<std::string> needed =
        NeededLibraries(harmona::plugin::ProgramDirectory() + "libharmona_ipod_plugin.so");
    EXPECT_TRUE(NeedsLibraryLike(needed, "libgpod"));
    EXPECT_TRUE(NeedsLibraryLike(needed, "libglib-2.0"));
}

TEST(IPodLoading, AnAvoidTimeoutRequestLoadsNeitherLibgpodNorGlib) {
    AddUser("admin", 1 | 4 | 8 | 16, "enu");
    // Even with an iPod attached: only a request that lists its playlists loads the reader.
    WriteFile("/usr/vanu/etc/audio/ipod/mountpoint", "/tmp/ipod\n");
    CgiRequest request;
    request.queryString = "action=avoid_timeout";
    // The dynamic loader reports every object it loads on standard error.
    request.extraEnv["LD_DEBUG"] = "files";
    const CgiResult r = RunCgi(request);
    ASSERT_TRUE(r.exited) << r.errors;
    EXPECT_EQ(r.exitStatus, 1);
    EXPECT_EQ(r.body, "{\"success\":true}\n");
    ASSERT_NE(r.errors.find("file=libjsoncpp"), std::string::npos)
        << "LD_DEBUG reports the loaded objects:\n"
        << r.errors;
    for (const char* heavy : kHeavyLibraries)
        EXPECT_EQ(r.errors.find(std::string("file=") + heavy), std::string::npos) << heavy;
    EXPECT_EQ(r.errors.find("libharmona_ipod_plugin"), std::string::npos);
}

}  // namespace
