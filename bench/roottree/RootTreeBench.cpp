// Root tree benchmark: "gettreenode" "audiotree_root" through the real CGI over a
// realistic fixture (1,000 personal playlists, 200 smart playlists, 50 shared playlists, an iPod
// with 50 playlists, a daemon with 30 media servers), wall time and peak memory beside a trivial C
// CGI in the same run; and what the UI texts cost, parsed once per builder (up to seven times).
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "platform/texts/LocalizedStringParser.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/IPodFixtures.h"
#include "tests/harness/PlaylistFixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/harness/ScriptedDaemon.h"

using namespace harmona::test;
using harmona::bench::CgiEnvironment;
using harmona::bench::Median;
using harmona::bench::PeakMemoryKb;
using harmona::bench::RunProcess;

namespace {

const std::string kRootQuery = "action=gettreenode&node=audiotree_root";

void MakeRealisticFixture() {
    InstallTexts();
    AddUser("admin", 1 | 4 | 8);
    WriteFile("/run/vanu/service/3.pid", std::to_string(getpid()) + "\n");
    MakeDirs("/volume1/music");
    std::vector<std::string> smart;
    for (int i = 0; i < 200; ++i)
        smart.push_back("Smart " + std::to_string(i));
    // The same personal playlists for the three users of the comparison rows.
    for (const char* user : {"admin", "noipod", "plain"}) {
        for (int i = 0; i < 1000; ++i)
            WritePersonalPlaylistFile(user, "Playlist " + std::to_string(i) + ".m3u");
        WriteSmartPlaylistFile(UserSmartPlaylistFile(user), smart);
    }
    std::vector<SharedPlaylistRow> shared;
    for (int i = 1; i <= 50; ++i)
        shared.push_back({i, "Shared " + std::to_string(i)});
    MakeLibraryDb({}, shared);
    std::vector<std::string> ipod;
    for (int i = 0; i < 50; ++i)
        ipod.push_back("iPod list " + std::to_string(i));
    AttachIPod(ipod);
}

// Tree nodes in a reply: every object that has an "id", at any depth.
std::size_t CountNodes(const Json::Value& value) {
    std::size_t count = value.isObject() && value.isMember("id") ? 1 : 0;
    if (value.isArray() || value.isObject())
        for (const Json::Value& member : value)
            count += CountNodes(member);
    return count;
}

struct Row {
    const char* label;
    std::string program;
    std::vector<std::string> environment;
    std::vector<double> ms;
    long peakKb = -1;
};

}  // namespace

int main(int argc, char** argv) {
    const bool exec = argc > 3 && std::string(argv[1]) == "--exec";
    const int runs = !exec && argc > 1 ? std::max(1, std::atoi(argv[1])) : 100;
    EnterSandbox();
    ResetSandbox();
    MakeRealisticFixture();
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(30)));
    WriteUsersConf({{"admin", {"13", ""}}, {"noipod", {"12", ""}}, {"plain", {"16", ""}}});
    // `--exec USER COMMAND...`: COMMAND (a profiler) runs the root request of USER over this
    // fixture.
    if (exec)
        return harmona::bench::RunWrapped(std::vector<std::string>(argv + 3, argv + argc),
                                          CgiProgram(), CgiEnvironment(kRootQuery, argv[2]));

    const std::string cgi = CgiProgram();
    const CgiResult check = Get(kRootQuery);
    if (check.exitStatus != 1 || !check.json.isArray() || check.json.size() != 6) {
        std::fprintf(stderr, "unexpected root reply (exit %d): %.300s\n", check.exitStatus,
                     check.body.c_str());
        return 1;
    }
    const std::size_t nodes = CountNodes(check.json);
    std::vector<Row> rows = {
        {"trivial C CGI", HARMONA_TRIVIAL_CGI, CgiEnvironment("", "admin"), {}},
        {"avoid_timeout", cgi, CgiEnvironment("action=avoid_timeout", "admin"), {}},
        {"root tree, realistic fixture", cgi, CgiEnvironment(kRootQuery, "admin"), {}},
        {"root tree, no iPod category", cgi, CgiEnvironment(kRootQuery, "noipod"), {}},
        {"root tree, no iPod, no media servers", cgi, CgiEnvironment(kRootQuery, "plain"), {}},
        // What the tree nodes cost alone: as many jsoncpp nodes as the full reply has, made with
        // FillTreeNode and printed, nothing listed or read.
        {"reply's nodes (JSON model floor)",
         HARMONA_NODE_FLOOR,
         {"NODE_COUNT=" + std::to_string(nodes)},
         {}},
    };
    // "noipod": permission 4|8, no iPod category; "plain": bit 16 alone, neither iPod nor media
    // servers: the rows show what each category costs.
    for (const Row& row : rows) {
        const harmona::bench::ProcessRun run = RunProcess(row.program, row.environment);
        std::printf("check: %-34s exit %d, %zu reply bytes\n", row.label, run.exitStatus,
                    run.output.size());
    }
    for (int i = 0; i < runs; ++i) {
        for (Row& row : rows)
            row.ms.push_back(RunProcess(row.program, row.environment).wallMs);
        TakeLogLines();
    }
    for (Row& row : rows)
        row.peakKb = PeakMemoryKb(row.program, row.environment);

    // The UI texts: the root request parses the table once for the root and once in each child
    // builder that looks texts up (up to seven times).
    const std::string texts = std::string(kTextsDir) + "enu";
    const auto start = std::chrono::steady_clock::now();
    const int parses = 7000;
    std::size_t sections = 0;
    for (int i = 0; i < parses; ++i)
        sections += VANU::ZET::LocalizedStringParser::ParseTexts(texts).size();
    const double parseUs =
        std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - start)
            .count() /
        parses;

    const double base = Median(rows[0].ms);
    std::printf(
        "root tree benchmark, %d runs each, interleaved; median wall time, peak memory (VmHWM)\n",
        runs);
    std::printf("%-34s %10s %10s %10s\n", "request", "median ms", "x trivial", "peak MiB");
    for (const Row& row : rows)
        std::printf("%-34s %10.2f %10.2f %10.1f\n", row.label, Median(row.ms),
                    Median(row.ms) / base, row.peakKb / 1024.0);
    std::printf(
        "UI texts (enu, %zu sections): %.1f us per parse, %.3f ms for the 7 parses of a root "
        "request\n",
        sections / parses, parseUs, 7 * parseUs / 1000.0);
    std::printf("the full reply holds %zu tree nodes (the floor row makes and prints as many)\n",
                nodes);
    return 0;
}
