// What every benchmark measures of a CGI process: its wall time from spawn to exit (reply read to
// its end), and its own peak resident memory (VmHWM read at its exit under ptrace; ru_maxrss would
// also count the benchmark process, whose pages a spawned child shares until its exec).
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace harmona::bench {

struct ProcessRun {
    double wallMs = 0;
    int exitStatus = -1;  // -1 when it did not exit normally
    std::string output;   // standard output
};

// Runs `program` with exactly `environment` ("NAME=value") and standard input from /dev/null.
ProcessRun RunProcess(const std::string& program, const std::vector<std::string>& environment);

// The program's VmHWM in KiB at its exit (-1 when it could not be read); output discarded.
long PeakMemoryKb(const std::string& program, const std::vector<std::string>& environment);

// Runs `command` with `program` appended as its last argument, with exactly `environment`, and
// waits for it; its exit status (1 when it did not exit normally). For the benchmarks' --exec
// modes, which put a profiler (perf, valgrind) in front of the CGI.
int RunWrapped(std::vector<std::string> command, const std::string& program,
               std::vector<std::string> environment);

// A GET request's CGI environment.
std::vector<std::string> CgiEnvironment(const std::string& queryString, const std::string& user);

// Exits with status 2, printing the reply, when `output` of the request named `label` does not hold
// `expected`: a request that does not answer as it should is not worth timing. `benchmark` names
// the program in the message.
void RequireReplyHolds(const char* benchmark, const std::string& label, const std::string& output,
                       const std::string& expected);

// Times `count` programs in interleaved rounds, so that drift of the machine hits all alike:
// `warmUps` rounds whose times are dropped, then `rounds` rounds whose order is rotated each time,
// so that no program always runs right after another. `runOnce(k)` runs program k and gives its
// wall time in ms; the result holds the `rounds` times of each program.
std::vector<std::vector<double>> TimeInRotatedRounds(
    std::size_t count, int warmUps, int rounds, const std::function<double(std::size_t)>& runOnce);

double Median(std::vector<double> samples);
// p from 0 to 1.
double Percentile(std::vector<double> samples, double p);

}  // namespace harmona::bench
