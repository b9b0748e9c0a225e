// Start-up cost of the audio tree CGI: wall time of whole CGI processes (spawn, reply read to the
// end, exit) as a web server sees them, beside a trivial C CGI timed in the same run, in rounds
// that interleave the programs so that drift of the machine hits all alike.
//
// Runs as root in a private mount namespace of its own, with tmpfs over /var/packages and
// /usr/vanu holding the fixtures (users.conf, a text table, an iPod database written with libgpod
// and its mountpoint file); nothing reaches the real machine but two empty mount points.
#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <sched.h>
#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <numeric>
#include <string>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "platform/lib/gpod/Database.h"
#include "platform/plugin/Plugin.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"

extern char** environ;

namespace {

using harmona::test::MakeDirs;
using harmona::test::WriteFile;

constexpr const char* kIPodMount = "/usr/vanu/bench-ipod";

void AttachIPod(int playlists) {
    MakeDirs(std::string(kIPodMount) + "/iPod_Control/iTunes");
    harmona::gpod::Database database = harmona::gpod::Database::Create(kIPodMount);
    Itdb_Playlist* master = itdb_playlist_new("iPod", FALSE);
    itdb_playlist_set_mpl(master);
    itdb_playlist_add(database.Get(), master, -1);
    for (int i = 0; i < playlists; ++i)
        itdb_playlist_add(database.Get(),
                          itdb_playlist_new(("Playlist " + std::to_string(i)).c_str(), FALSE), -1);
    std::string error;
    if (!database.Write(error)) {
        std::fprintf(stderr, "bench_startup: itdb_write: %s\n", error.c_str());
        std::exit(2);
    }
    WriteFile("/usr/vanu/etc/audio/ipod/mountpoint", std::string(kIPodMount) + "\n");
}

struct Program {
    std::string label;
    std::string path;
    std::string query;
    std::string expect;  // a text the reply must hold
    std::vector<double> ms;
};

// Runs one CGI process to its end; returns its wall time in ms and its standard output.
double RunOnce(const Program& program, std::string& output) {
    harmona::bench::ProcessRun run = harmona::bench::RunProcess(
        program.path, harmona::bench::CgiEnvironment(program.query, "admin"));
    output = std::move(run.output);
    return run.wallMs;
}

using harmona::bench::Median;
using harmona::bench::Percentile;

double Mean(const std::vector<double>& v) {
    return std::accumulate(v.begin(), v.end(), 0.0) / static_cast<double>(v.size());
}

// Runs `programs` in `runs` interleaved rounds (after a warm-up) and prints the figures.
void Measure(const char* title, std::vector<Program>& programs, int runs) {
    std::string output;
    for (Program& program : programs) {
        RunOnce(program, output);
        harmona::bench::RequireReplyHolds("bench_startup", program.label, output, program.expect);
    }
    const std::vector<std::vector<double>> times = harmona::bench::TimeInRotatedRounds(
        programs.size(), 20, runs, [&](std::size_t k) { return RunOnce(programs[k], output); });
    for (std::size_t k = 0; k < programs.size(); ++k)
        programs[k].ms = times[k];
    const double trivialMedian = Median(programs[0].ms);
    const double trivialMean = Mean(programs[0].ms);
    std::printf("\n%s (%d runs each)\n", title, runs);
    std::printf("  %-34s %8s %8s %8s %8s %9s %9s\n", "program", "median", "mean", "p90", "min",
                "x median", "x mean");
    for (const Program& program : programs)
        std::printf("  %-34s %7.3fms %7.3fms %7.3fms %7.3fms %8.2fx %8.2fx\n",
                    program.label.c_str(), Median(program.ms), Mean(program.ms),
                    Percentile(program.ms, 0.9),
                    *std::min_element(program.ms.begin(), program.ms.end()),
                    Median(program.ms) / trivialMedian, Mean(program.ms) / trivialMean);
}

}  // namespace

int main(int argc, char** argv) {
    int runs = 400;
    int playlists = 50;
    for (int i = 1; i + 1 < argc; i += 2) {
        if (std::strcmp(argv[i], "--runs") == 0)
            runs = std::max(1, std::atoi(argv[i + 1]));
        else if (std::strcmp(argv[i], "--playlists") == 0)
            playlists = std::max(0, std::atoi(argv[i + 1]));
    }
    const std::string dir = harmona::plugin::ProgramDirectory();
    // The private mount and network namespaces of the tests, with tmpfs over the fixed roots.
    harmona::test::EnterSandbox();
    WriteFile("/var/packages/Harmona/etc/users.conf", "[admin]\npermission=29\nlanguage=enu\n");
    WriteFile("/var/packages/Harmona/target/app/texts/enu/strings",
              "[player]\nrefresh_btn_title=Refresh\n");

    const std::string trivial = dir + "bench_trivial_cgi";
    const std::string cgi = dir + "audiotree.cgi";
    const std::string ok = "{\"success\":true}";

    std::vector<Program> plain = {
        {"trivial C CGI", trivial, "", ok, {}},
        {"audiotree.cgi avoid_timeout", cgi, "action=avoid_timeout", ok, {}}};
    Measure("No iPod attached", plain, runs);

    AttachIPod(playlists);
    std::vector<Program> ipod = {
        {"trivial C CGI", trivial, "", ok, {}},
        {"audiotree.cgi avoid_timeout", cgi, "action=avoid_timeout", ok, {}},
        // The iPod's playlists are children of "ipod_root"; with none the items are null.
        {"refresh target=ipod (" + std::to_string(playlists) + " playlists)",
         cgi,
         "action=refresh&target=ipod",
         playlists > 0 ? "\"pid\":\"ipod_root\"" : "\"items\":null",
         {}}};
    Measure("iPod attached", ipod, runs);
    return 0;
}
