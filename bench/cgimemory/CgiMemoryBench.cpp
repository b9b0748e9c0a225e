// Peak memory of one CGI request that lists a container of N tracks (100,000 by default) served by
// the real harmona-mediad over a generated library.db, next to the size of its reply: library.cgi
// ("list" of musiclib_music_all) and audiotree.cgi ("gettreenode" of the same node). Each CGI pages
// on from NumberReturned until it holds the whole container. Runs inside the test sandbox (private
// mount and network namespace; needs root).
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/mediad/MediadTestKit.h"

using namespace harmona::test;

namespace {

std::size_t Count(const std::string& text, const std::string& what) {
    std::size_t count = 0;
    for (std::size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1))
        ++count;
    return count;
}

struct Row {
    const char* label;
    std::string program;
    std::string query;
    const char* perObject;  // a text that each listed object's JSON holds once
};

}  // namespace

int main(int argc, char** argv) {
    const long tracks = argc > 1 ? std::atol(argv[1]) : 100000;
    EnterSandbox();
    ResetSandbox();
    AddUser("admin", 1 | 4 | 8 | 16);
    WriteFile(std::string(kTextsDir) + "enu/strings", "[common]\nclass_music_album=Albums\n");
    MakeGeneratedLibrary(tracks);
    mediad::ServerProcess server;
    if (!server.Start()) {
        std::fprintf(stderr, "cgi memory bench: harmona-mediad did not come up\n");
        return 1;
    }
    const Row rows[] = {
        {"library.cgi list", LibraryCgiProgram(), "action=list&node=musiclib_music_all",
         "\"stream\""},
        {"audiotree.cgi gettreenode", CgiProgram(), "action=gettreenode&node=musiclib_music_all",
         "\"id\""},
    };
    std::printf("One request listing a container of %ld tracks from harmona-mediad:\n", tracks);
    for (const Row& row : rows) {
        const auto environment = harmona::bench::CgiEnvironment(row.query, "admin");
        // The first run also makes the server load the library; the measured ones come after.
        const harmona::bench::ProcessRun run = harmona::bench::RunProcess(row.program, environment);
        const long peak = harmona::bench::PeakMemoryKb(row.program, environment);
        const std::size_t body =
            run.output.size() - std::min(run.output.size(), run.output.find("\r\n\r\n") + 4);
        std::printf(
            "  %-28s peak %8.1f MiB  reply %8.1f MiB (%zu bytes, %zu objects)  %.0f ms, exit %d\n",
            row.label, peak / 1024.0, body / 1048576.0, body, Count(run.output, row.perObject),
            run.wallMs, run.exitStatus);
    }
    server.Stop();
    return 0;
}
