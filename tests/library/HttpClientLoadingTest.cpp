// Only the requests that browse may pay for the HTTP client: audiotree.cgi must not link libcurl,
// and a request that does not browse must not load it.
#include <elf.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>

#include "tests/harness/ScriptedHttpServer.h"
#include "tests/library/LibraryFixture.h"

using namespace harmona::test;

namespace {

// The DT_NEEDED entries of a 64-bit ELF file, read from its section headers.
std::vector<std::string> NeededLibraries(const std::string& path) {
    const std::string image = ReadFile(path);
    std::vector<std::string> needed;
    if (image.size() < sizeof(Elf64_Ehdr) || std::memcmp(image.data(), ELFMAG, SELFMAG) != 0)
        return needed;
    Elf64_Ehdr header;
    std::memcpy(&header, image.data(), sizeof(header));
    std::vector<Elf64_Shdr> sections(header.e_shnum);
    for (std::size_t i = 0; i < sections.size(); ++i)
        std::memcpy(&sections[i], image.data() + header.e_shoff + i * header.e_shentsize,
                    sizeof(Elf64_Shdr));
    for (const Elf64_Shdr& section : sections) {
        if (section.sh_type != SHT_DYNAMIC)
            continue;
        const Elf64_Shdr& strings = sections.at(section.sh_link);
        for (std::size_t at = 0; at + sizeof(Elf64_Dyn) <= section.sh_size;
             at += sizeof(Elf64_Dyn)) {
            Elf64_Dyn entry;
            std::memcpy(&entry, image.data() + section.sh_offset + at, sizeof(entry));
            if (entry.d_tag == DT_NEEDED)
                needed.emplace_back(image.data() + strings.sh_offset + entry.d_un.d_val);
        }
    }
    return needed;
}

std::string Ldd(const std::string& path) {
    std::string output;
    if (FILE* pipe = popen(("ldd '" + path + "' 2>&1").c_str(), "r")) {
        char buffer[4096];
        while (std::size_t n = fread(buffer, 1, sizeof(buffer), pipe))
            output.append(buffer, n);
        pclose(pipe);
    }
    return output;
}

TEST(HttpClientLoading, CgiDoesNotLinkLibcurl) {
    const std::vector<std::string> needed = NeededLibraries(CgiProgram());
    ASSERT_FALSE(needed.empty()) << "no DT_NEEDED read from " << CgiProgram();
    for (const std::string& library : needed)
        EXPECT_EQ(library.find("curl"), std::string::npos) << library;
    // Nor through any library it links (ldd resolves the whole closure).
    const std::string closure = Ldd(CgiProgram());
    EXPECT_NE(closure.find("libc.so"), std::string::npos) << closure;
    EXPECT_EQ(closure.find("libcurl"), std::string::npos) << closure;
}

TEST(HttpClientLoading, PluginHoldsTheHttpClient) {
    const std::string plugin =
        CgiProgram().substr(0, CgiProgram().rfind('/') + 1) + "libharmona_http_plugin.so";
    ASSERT_TRUE(Exists(plugin));
    bool linksCurl = false;
    for (const std::string& library : NeededLibraries(plugin))
        linksCurl |= library.find("libcurl") != std::string::npos;
    EXPECT_TRUE(linksCurl);
}

// Runs the CGI with the dynamic loader's trace of the files it loads (LD_DEBUG=files).
CgiResult RunTraced(const std::string& query) {
    CgiRequest request;
    request.queryString = query;
    request.extraEnv["LD_DEBUG"] = "files";
    return RunCgi(request);
}

TEST(HttpClientLoading, AvoidTimeoutDoesNotLoadLibcurlButABrowseDoes) {
    LibraryFixture();
    const CgiResult keepAlive = RunTraced("action=avoid_timeout");
    EXPECT_EQ(keepAlive.exitStatus, 1);
    EXPECT_NE(keepAlive.errors.find("file=libc.so"), std::string::npos) << "no loader trace";
    EXPECT_EQ(keepAlive.errors.find("libcurl"), std::string::npos);
    EXPECT_EQ(keepAlive.errors.find("libharmona_http_plugin"), std::string::npos);

    // The category list and the other families send nothing: no HTTP client either.
    for (const char* node : {"musiclib_root", "ipod_root", "musiclib"}) {
        const CgiResult r = RunTraced(Query({{"action", "gettreenode"}, {"node", node}}));
        EXPECT_EQ(r.errors.find("libcurl"), std::string::npos) << node;
    }

    ScriptedHttpServer server;
    server.Enqueue(Reply(BrowseResponseBody(DidlLite({}), 0, 0)));
    ASSERT_TRUE(server.Start());
    const CgiResult browse =
        RunTraced(Query({{"action", "gettreenode"}, {"node", "musiclib_music_all"}}));
    EXPECT_EQ(browse.exitStatus, 1);
    EXPECT_NE(browse.errors.find("libharmona_http_plugin"), std::string::npos);
    EXPECT_NE(browse.errors.find("libcurl"), std::string::npos);
}

}  // namespace
