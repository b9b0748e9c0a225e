// Small helpers of the daemon client tests: the log lines that this process sent, and a clock.
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "tests/harness/Sandbox.h"

namespace harmona::test {

// The messages (text after "tag: ") logged since the last call, after a short settle.
inline std::vector<std::string> LoggedMessages(int settleMs = 30) {
    std::vector<std::string> messages;
    for (const LogLine& line : TakeLogLines(settleMs))
        messages.push_back(line.message);
    return messages;
}

class Stopwatch {
  public:
    double ElapsedMs() const {
        return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start_)
            .count();
    }

  private:
    std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
};

}  // namespace harmona::test
