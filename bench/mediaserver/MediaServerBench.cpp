// Benchmark: "refresh" "mediaserver" through the real CGI against a scripted daemon with 100
// servers, beside a trivial C CGI; prints median and mean wall times and their ratio.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <numeric>
#include <string>
#include <vector>

#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/harness/ScriptedDaemon.h"

using namespace harmona::test;

namespace {

struct Stats {
    double median = 0;
    double mean = 0;
    double p90 = 0;
};

Stats Summarize(std::vector<double> samples) {
    std::sort(samples.begin(), samples.end());
    Stats stats;
    stats.median = samples[samples.size() / 2];
    stats.p90 = samples[samples.size() * 9 / 10];
    stats.mean = std::accumulate(samples.begin(), samples.end(), 0.0) / samples.size();
    return stats;
}

}  // namespace

int main(int argc, char** argv) {
    const int runs = argc > 1 ? std::max(1, std::atoi(argv[1])) : 200;
    EnterSandbox();
    ResetSandbox();
    WriteFile(std::string(kTextsDir) + "enu/strings", "[common]\nbtn_scan_dms=\"Scan\"\n");
    AddUser("admin", 1 | 4 | 8 | 16);
    ScriptedDaemon daemon(ServeMediaServers(MakeMediaServers(100)));

    CgiRequest refresh;
    refresh.queryString = Query({{"action", "refresh"}, {"target", "mediaserver"}});
    CgiRequest trivial;
    trivial.program = TRIVIAL_CGI_PATH;

    // One checked run first: the figures are only worth something if the reply is right.
    const CgiResult check = RunCgi(refresh);
    if (!check.jsonOk || check.json["items"].size() != 100) {
        std::fprintf(stderr, "unexpected reply: %s\n", check.body.c_str());
        return 1;
    }
    std::vector<double> refreshMs;
    std::vector<double> trivialMs;
    for (int i = 0; i < runs; ++i) {
        refreshMs.push_back(RunCgi(refresh).wallMs);
        trivialMs.push_back(RunCgi(trivial).wallMs);
        TakeLogLines();
    }
    const Stats a = Summarize(refreshMs);
    const Stats b = Summarize(trivialMs);
    std::printf("runs: %d (alternating), daemon: 100 servers, 11 exchanges per refresh\n", runs);
    std::printf("refresh mediaserver: median %.2f ms, mean %.2f ms, p90 %.2f ms\n", a.median,
                a.mean, a.p90);
    std::printf("trivial C CGI:       median %.2f ms, mean %.2f ms, p90 %.2f ms\n", b.median,
                b.mean, b.p90);
    std::printf("ratio (median): %.2f\n", a.median / b.median);
    return 0;
}
