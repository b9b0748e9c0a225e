#include "bench/common/BenchProcess.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>

namespace harmona::bench {
namespace {

std::vector<char*> Pointers(const std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (const std::string& text : texts)
        pointers.push_back(const_cast<char*>(text.c_str()));
    pointers.push_back(nullptr);
    return pointers;
}

long ReadVmHwmKb(pid_t pid) {
    std::ifstream in("/proc/" + std::to_string(pid) + "/status");
    std::string line;
    while (std::getline(in, line)) {
        if (line.rfind("VmHWM:", 0) == 0)
            return std::atol(line.c_str() + 6);
    }
    return -1;
}

}  // namespace

int RunWrapped(std::vector<std::string> command, const std::string& program,
               std::vector<std::string> environment) {
    command.push_back(program);
    std::vector<char*> argv = Pointers(command);
    std::vector<char*> envp = Pointers(environment);
    const pid_t pid = fork();
    if (pid < 0)
        return 1;
    if (pid == 0) {
        execvpe(argv[0], argv.data(), envp.data());
        _exit(127);
    }
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : 1;
}

std::vector<std::string> CgiEnvironment(const std::string& queryString, const std::string& user) {
    return {"GATEWAY_INTERFACE=CGI/1.1", "REQUEST_METHOD=GET", "QUERY_STRING=" + queryString,
            "REMOTE_USER=" + user, "PATH=/usr/bin:/bin"};
}

ProcessRun RunProcess(const std::string& program, const std::vector<std::string>& environment) {
    ProcessRun run;
    std::vector<char*> envp = Pointers(environment);
    char* argv[] = {const_cast<char*>(program.c_str()), nullptr};
    int out[2];
    if (pipe2(out, O_CLOEXEC) != 0)
        return run;
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, out[1], 1);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    const auto start = std::chrono::steady_clock::now();
    pid_t pid = 0;
    const int spawned = posix_spawn(&pid, program.c_str(), &actions, nullptr, argv, envp.data());
    close(out[1]);
    posix_spawn_file_actions_destroy(&actions);
    if (spawned != 0) {
        close(out[0]);
        return run;
    }
    char buffer[65536];
    for (;;) {
        const ssize_t n = read(out[0], buffer, sizeof(buffer));
        if (n < 0 && errno == EINTR)
            continue;
        if (n <= 0)
            break;
        run.output.append(buffer, static_cast<std::size_t>(n));
    }
    close(out[0]);
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    run.wallMs =
        std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
    run.exitStatus = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return run;
}

long PeakMemoryKb(const std::string& program, const std::vector<std::string>& environment) {
    std::vector<char*> envp = Pointers(environment);
    char* argv[] = {const_cast<char*>(program.c_str()), nullptr};
    const pid_t pid = fork();
    if (pid < 0)
        return -1;
    if (pid == 0) {
        const int null = open("/dev/null", O_RDWR);
        dup2(null, 0);
        dup2(null, 1);
        ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        execve(argv[0], argv, envp.data());
        _exit(127);
    }
    int status = 0;
    waitpid(pid, &status, 0);  // stopped after its exec
    ptrace(PTRACE_SETOPTIONS, pid, nullptr, reinterpret_cast<void*>(PTRACE_O_TRACEEXIT));
    ptrace(PTRACE_CONT, pid, nullptr, nullptr);
    long peakKb = -1;
    while (waitpid(pid, &status, 0) == pid && !WIFEXITED(status) && !WIFSIGNALED(status)) {
        if (status >> 8 == (SIGTRAP | (PTRACE_EVENT_EXIT << 8)))
            peakKb = ReadVmHwmKb(pid);
        const int signal = WIFSTOPPED(status) && WSTOPSIG(status) != SIGTRAP ? WSTOPSIG(status) : 0;
        ptrace(PTRACE_CONT, pid, nullptr, reinterpret_cast<void*>(static_cast<long>(signal)));
    }
    return peakKb;
}

void RequireReplyHolds(const char* benchmark, const std::string& label, const std::string& output,
                       const std::string& expected) {
    if (output.find(expected) != std::string::npos)
        return;
    std::fprintf(stderr, "%s: %s: unexpected reply:\n%.2000s\n", benchmark, label.c_str(),
                 output.c_str());
    std::exit(2);
}

std::vector<std::vector<double>> TimeInRotatedRounds(
    std::size_t count, int warmUps, int rounds, const std::function<double(std::size_t)>& runOnce) {
    for (int warm = 0; warm < warmUps; ++warm)
        for (std::size_t k = 0; k < count; ++k)
            runOnce(k);
    std::vector<std::vector<double>> times(count);
    for (int round = 0; round < rounds; ++round) {
        for (std::size_t step = 0; step < count; ++step) {
            const std::size_t k = (step + static_cast<std::size_t>(round)) % count;
            times[k].push_back(runOnce(k));
        }
    }
    return times;
}

double Median(std::vector<double> samples) {
    return Percentile(std::move(samples), 0.5);
}

double Percentile(std::vector<double> samples, double p) {
    if (samples.empty())
        return 0;
    std::sort(samples.begin(), samples.end());
    const std::size_t index =
        std::min(samples.size() - 1, static_cast<std::size_t>(p * samples.size()));
    return samples[index];
}

}  // namespace harmona::bench
