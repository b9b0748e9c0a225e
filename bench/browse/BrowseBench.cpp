// Browse benchmark: wall time and peak memory of one "gettreenode" request that lists a
// container of 10,000 and of 100,000 children from a scripted ContentDirectory on 127.0.0.1:50003,
// beside, in the same run, (a) a trivial C CGI process and (b) the same Browse fetched with curl.
// Runs inside the test sandbox (private mount + network namespace; needs root).
#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "bench/common/BenchProcess.h"
#include "tests/harness/CgiRunner.h"
#include "tests/harness/Fixtures.h"
#include "tests/harness/Sandbox.h"
#include "tests/harness/ScriptedHttpServer.h"

using namespace harmona::test;

namespace {

struct Run {
    double wallMs = 0;
    long peakKiB = 0;
    std::size_t outputBytes = 0;
    int status = -1;
};

// Runs argv with env, discarding its output (counted), and measures it with wait4.
Run Measure(const std::vector<std::string>& argv, const std::vector<std::string>& env) {
    int out[2];
    if (pipe(out) != 0)
        return {};
    std::vector<char*> args, envp;
    for (const std::string& a : argv)
        args.push_back(const_cast<char*>(a.c_str()));
    args.push_back(nullptr);
    for (const std::string& e : env)
        envp.push_back(const_cast<char*>(e.c_str()));
    envp.push_back(nullptr);
    // posix_spawn (vfork semantics): the child never holds a copy of this process's memory, so its
    // peak resident set is its own.
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, out[1], 1);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addclose(&actions, out[0]);
    const auto start = std::chrono::steady_clock::now();
    pid_t pid = -1;
    const int spawned = posix_spawn(&pid, args[0], &actions, nullptr, args.data(), envp.data());
    posix_spawn_file_actions_destroy(&actions);
    close(out[1]);
    if (spawned != 0) {
        close(out[0]);
        return {};
    }
    Run run;
    char buffer[1 << 16];
    for (ssize_t n; (n = read(out[0], buffer, sizeof(buffer))) > 0;)
        run.outputBytes += static_cast<std::size_t>(n);
    close(out[0]);
    int status = 0;
    rusage usage{};
    wait4(pid, &status, 0, &usage);
    run.wallMs =
        std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
    run.peakKiB = usage.ru_maxrss;
    run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return run;
}

Run Median(std::vector<Run> runs) {
    std::sort(runs.begin(), runs.end(),
              [](const Run& a, const Run& b) { return a.wallMs < b.wallMs; });
    Run median = runs[runs.size() / 2];
    for (const Run& r : runs)
        median.peakKiB = std::max(median.peakKiB, r.peakKiB);
    return median;
}

std::vector<std::string> CgiEnv(const std::string& query) {
    return {"GATEWAY_INTERFACE=CGI/1.1", "REQUEST_METHOD=GET", "QUERY_STRING=" + query,
            "REMOTE_USER=admin", "PATH=/usr/bin:/bin"};
}

std::string Envelope(const std::string& objectId) {
    return "<?xml version=\"1.0\" encoding=\"utf-8\"?>\r\n<s:Envelope "
           "xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\" "
           "s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body><u:Browse "
           "xmlns:u=\"urn:schemas-upnp-org:service:ContentDirectory:1\"><ObjectID>" +
           objectId +
           "</ObjectID><BrowseFlag>BrowseDirectChildren</BrowseFlag><Filter>*</Filter>"
           "<StartingIndex>0</StartingIndex><RequestedCount>0</RequestedCount><SortCriteria>"
           "</SortCriteria></u:Browse></s:Body></s:Envelope>\r\n";
}

void Print(const char* what, const Run& r, const Run& baseline) {
    std::printf("  %-34s %9.1f ms  %8.1f MiB  (%.2fx trivial)  exit %d, %zu bytes out\n", what,
                r.wallMs, r.peakKiB / 1024.0, r.wallMs / baseline.wallMs, r.status, r.outputBytes);
}

}  // namespace

int main(int argc, char** argv) {
    const bool exec = argc > 3 && std::string(argv[1]) == "--exec";
    const int repeats = !exec && argc > 1 ? std::atoi(argv[1]) : 5;
    EnterSandbox();
    ResetSandbox();
    AddUser("admin", 1 | 4 | 8 | 16);
    WriteFile(std::string(kTextsDir) + "enu/strings", "[common]\nclass_music_album=Albums\n");

    // The scripted server lives in a child process, so that this process stays small: a spawned
    // child's peak resident set starts from its parent's (Linux accounts it at exec).
    const std::vector<std::size_t> sizes = {10000, 100000};
    std::vector<std::size_t> replySizes(sizes.size());
    int ready[2];
    if (pipe(ready) != 0)
        return 1;
    const pid_t serverPid = fork();
    if (serverPid == 0) {
        close(ready[0]);
        ContentTree tree;
        std::vector<ScriptedReply> replies;
        for (std::size_t size : sizes) {
            const std::string id = "big" + std::to_string(size);
            tree.AddManyItems(id, size, id + "-");
            RecordedRequest request;
            request.isBrowse = true;
            request.objectId = id;
            request.browseFlag = "BrowseDirectChildren";
            replies.push_back(tree.Answer(request));
        }
        ScriptedHttpServer server;
        server.SetResponder([&](const RecordedRequest& r) {
            for (std::size_t i = 0; i < sizes.size(); ++i)
                if (r.objectId == "big" + std::to_string(sizes[i]))
                    return replies[i];
            return Reply("", 404);
        });
        if (!server.Start())
            _exit(1);
        for (const ScriptedReply& reply : replies) {
            const std::size_t size = reply.body.size();
            (void)!write(ready[1], &size, sizeof(size));
        }
        pause();
        _exit(0);
    }
    close(ready[1]);
    for (std::size_t& size : replySizes) {
        if (read(ready[0], &size, sizeof(size)) != static_cast<ssize_t>(sizeof(size))) {
            std::fprintf(stderr, "the scripted server did not start on 127.0.0.1:50003\n");
            return 1;
        }
    }
    if (exec) {
        // `--exec SIZE COMMAND...`: COMMAND (a profiler) runs the CGI request that lists the
        // container of SIZE children (10000 or 100000) against this scripted server.
        const int status = harmona::bench::RunWrapped(
            std::vector<std::string>(argv + 3, argv + argc), CgiProgram(),
            CgiEnv("action=gettreenode&node=musiclib_big" + std::string(argv[2])));
        kill(serverPid, SIGTERM);
        waitpid(serverPid, nullptr, 0);
        return status;
    }
    const std::string cgi = CgiProgram();
    std::vector<Run> trivial, keepAlive;
    for (int i = 0; i < repeats * 2; ++i) {
        trivial.push_back(Measure({HARMONA_TRIVIAL_CGI}, CgiEnv("")));
        keepAlive.push_back(Measure({cgi}, CgiEnv("action=avoid_timeout")));
    }
    const Run baseline = Median(trivial);
    std::printf("browse benchmark, median of %d runs (peak memory: the largest of the runs)\n",
                repeats);
    Print("trivial C CGI", baseline, baseline);
    Print("audiotree.cgi avoid_timeout", Median(keepAlive), baseline);
    for (std::size_t i = 0; i < sizes.size(); ++i) {
        const std::string id = "big" + std::to_string(sizes[i]);
        WriteFile("/tmp/envelope.xml", Envelope(id));
        std::vector<Run> curl, browse, floor;
        for (int r = 0; r < repeats; ++r) {
            curl.push_back(
                Measure({"/usr/bin/curl", "-s", "-o", "/dev/null", "-H",
                         "SOAPACTION: \"urn:schemas-upnp-org:service:ContentDirectory:1#Browse\"",
                         "-H", "Content-Type: text/xml; charset=\"utf-8\"", "--data-binary",
                         "@/tmp/envelope.xml", "http://127.0.0.1:50003/ContentDirectory/control"},
                        CgiEnv("")));
            browse.push_back(Measure({cgi}, CgiEnv("action=gettreenode&node=musiclib_" + id)));
            floor.push_back(Measure({HARMONA_NODE_FLOOR, std::to_string(sizes[i])}, CgiEnv("")));
        }
        const Run c = Median(curl), b = Median(browse), f = Median(floor);
        const double replyMiB = replySizes[i] / 1048576.0;
        std::printf("%zu children (reply %.1f MiB):\n", sizes[i], replyMiB);
        Print("curl Browse (raw fetch)", c, baseline);
        Print("audiotree.cgi gettreenode", b, baseline);
        Print("nodes alone (JSON model floor)", f, baseline);
        std::printf(
            "  CGI / curl wall: %.2fx (target 1.3x at 10,000)   CGI peak %.1f MiB vs 3x reply + 10 "
            "MiB "
            "= %.1f MiB\n",
            b.wallMs / c.wallMs, b.peakKiB / 1024.0, 3 * replyMiB + 10);
        std::printf(
            "  floor / curl wall: %.2fx; floor peak %.1f MiB (its nodes made with FillTreeNode "
            "into Json::Value and printed, nothing fetched or parsed)\n",
            f.wallMs / c.wallMs, f.peakKiB / 1024.0);
    }
    kill(serverPid, SIGTERM);
    waitpid(serverPid, nullptr, 0);
    return 0;
}
