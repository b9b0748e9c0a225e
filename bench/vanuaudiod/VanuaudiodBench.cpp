// Benchmark of vanuaudiod's control socket: command 16 round trips per second from one sequential
// client, and latency under 50 concurrent clients, with the real daemon holding 100 servers found
// over SSDP in the sandbox's veth network. A trivial C CGI process run is the yardstick.
#include <signal.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Sandbox.h"
#include "tests/vanuaudiod/DaemonKit.h"

using namespace harmona::test;
using harmona::bench::Percentile;
using SteadyClock = std::chrono::steady_clock;

namespace {

struct Phase {
    std::vector<double> ms;
    int missed = 0;  // not answered within the 0.5 s budget
    double seconds = 0;

    void Record(const Exchange& exchange) {
        if (!exchange.answered)
            ++missed;
        ms.push_back(exchange.ms);
    }
};

// One client, sequential, for `seconds`.
Phase Sequential(double seconds) {
    Phase phase;
    const auto start = SteadyClock::now();
    const auto end = start + std::chrono::duration<double>(seconds);
    int page = 0;
    while (SteadyClock::now() < end) {
        phase.Record(Call(16, std::to_string((page++ % 10) * 10) + " 10"));
    }
    phase.seconds = std::chrono::duration<double>(SteadyClock::now() - start).count();
    return phase;
}

// `clients` clients released together, each making one exchange; `bursts` times.
Phase Bursts(int clients, int bursts) {
    Phase phase;
    const auto start = SteadyClock::now();
    for (int b = 0; b < bursts; ++b) {
        std::promise<void> go;
        std::shared_future<void> released = go.get_future().share();
        std::vector<std::future<Exchange>> results;
        for (int i = 0; i < clients; ++i) {
            results.push_back(std::async(std::launch::async, [released, i] {
                released.wait();
                return Call(16, std::to_string((i % 10) * 10) + " 10");
            }));
        }
        go.set_value();
        for (auto& result : results)
            phase.Record(result.get());
    }
    phase.seconds = std::chrono::duration<double>(SteadyClock::now() - start).count();
    return phase;
}

// `clients` clients each looping for `seconds`.
Phase Sustained(int clients, double seconds) {
    Phase phase;
    std::vector<std::future<Phase>> results;
    const auto start = SteadyClock::now();
    const auto end = start + std::chrono::duration<double>(seconds);
    for (int i = 0; i < clients; ++i) {
        results.push_back(std::async(std::launch::async, [end, i] {
            Phase own;
            int page = i;
            while (SteadyClock::now() < end) {
                own.Record(Call(16, std::to_string((page++ % 10) * 10) + " 10"));
            }
            return own;
        }));
    }
    for (auto& result : results) {
        const Phase own = result.get();
        phase.ms.insert(phase.ms.end(), own.ms.begin(), own.ms.end());
        phase.missed += own.missed;
    }
    phase.seconds = std::chrono::duration<double>(SteadyClock::now() - start).count();
    return phase;
}

// Time from a server's ssdp:alive to its appearance in command 16, for `count` new servers
// announced one after the other (polled every millisecond).
std::vector<double> DiscoveryTimes(FakeMediaServers& fake, int count) {
    std::vector<double> ms;
    for (int i = 0; i < count; ++i) {
        const std::string udn = "uuid:first-" + std::to_string(i);
        fake.Add(udn, FakeMediaServers::DescriptionXml(udn, "First " + std::to_string(i), "/cd"));
        const auto start = SteadyClock::now();
        fake.Alive(udn, 1800);
        const auto deadline = start + std::chrono::seconds(5);
        for (;;) {
            Json::Value page;
            const Exchange exchange = Call(16, "0 10");
            if (ParseJson(exchange.reply, page) && page["total"].asInt() == i + 1) {
                ms.push_back(
                    std::chrono::duration<double, std::milli>(SteadyClock::now() - start).count());
                break;
            }
            if (SteadyClock::now() > deadline) {
                ms.push_back(5000);
                break;
            }
            DrainSyslog();
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    }
    return ms;
}

void Print(const char* name, const Phase& phase, double trivialMs) {
    const double median = Percentile(phase.ms, 0.5);
    std::printf("%-38s %8zu %10.0f %9.3f %9.3f %9.3f %7d %9.4f\n", name, phase.ms.size(),
                phase.ms.size() / phase.seconds, median, Percentile(phase.ms, 0.99),
                Percentile(phase.ms, 1.0), phase.missed, median / trivialMs);
}

}  // namespace

int main(int argc, char** argv) {
    const double seconds = argc > 1 ? std::max(0.5, std::atof(argv[1])) : 3.0;
    // Another build's daemon (the one to compare with) instead of this build's.
    const bool otherDaemon = argc > 2;
    if (otherDaemon)
        UseDaemonProgram(argv[2]);
    std::printf("daemon: %s\n", DaemonProgram().c_str());
    EnterSandbox();
    ResetSandbox();
    PeerNetwork peer;
    if (!peer)
        return 1;
    // This build's daemon says when discovery listens; another build's may not.
    Process daemon = StartDaemon(kHostInterface, !otherDaemon);
    if (otherDaemon)
        std::this_thread::sleep_for(std::chrono::seconds(1));
    FakeMediaServers fake;
    const std::vector<double> discovery = DiscoveryTimes(fake, 10);
    std::printf(
        "discovery, alive to listed in command 16 (10 servers): median %.1f ms, max %.1f "
        "ms\n",
        Percentile(discovery, 0.5), Percentile(discovery, 1.0));
    for (int i = 10; i < 100; ++i) {
        const std::string udn = "uuid:bench-" + std::to_string(1000 + i);
        fake.Add(udn, FakeMediaServers::DescriptionXml(
                          udn, "Media Server " + std::to_string(1000 + i),
                          "/ContentDirectory/control/" + std::to_string(i)));
        fake.Alive(udn, 1800);
    }
    WaitForList([](const Json::Value& list) { return list.size() == 100; }, 15000);
    Json::Value check;
    const Exchange first = Call(16, "0 10");
    if (!ParseJson(first.reply, check) || check["total"].asInt() != 100 ||
        check["list"].size() != 10) {
        std::fprintf(stderr, "daemon did not list the 100 servers: %s\n", first.reply.c_str());
        return 1;
    }
    std::printf("page of 10 servers: %zu bytes\n", first.reply.size());

    // The yardstick: a trivial C CGI's process run, measured in the same run.
    std::vector<double> trivial;
    CgiRequest request;
    request.program = HARMONA_TRIVIAL_CGI;
    for (int i = 0; i < 200; ++i)
        trivial.push_back(RunCgi(request).wallMs);
    TakeLogLines();
    const double trivialMs = Percentile(trivial, 0.5);
    std::printf("trivial C CGI process run: median %.3f ms\n\n", trivialMs);

    std::printf("%-38s %8s %10s %9s %9s %9s %7s %9s\n", "phase", "requests", "per s", "median ms",
                "p99 ms", "max ms", "missed", "x trivial");
    Print("1 client, sequential", Sequential(seconds), trivialMs);
    Print("50 clients released together x 40", Bursts(50, 40), trivialMs);
    Print("50 clients looping", Sustained(50, seconds), trivialMs);
    std::printf(
        "\n(\"missed\": not answered within the CGI client's 0.5 s budget; \"x trivial\": median "
        "over the trivial CGI's median)\n");
    daemon.Stop(SIGTERM, 5000);
    return 0;
}
