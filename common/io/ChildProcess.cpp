#include "common/io/ChildProcess.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

namespace harmona::io {

ChildProcess& ChildProcess::operator=(ChildProcess&& other) noexcept {
    if (this != &other) {
        Kill();
        pid_ = other.pid_;
        other.pid_ = -1;
    }
    return *this;
}

ChildProcess ChildProcess::Start(const std::function<int(int writeFd)>& work,
                                 FileDescriptor& output) {
    output.Reset();
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        return ChildProcess();
    FileDescriptor readEnd(ends[0]);
    FileDescriptor writeEnd(ends[1]);
    const pid_t pid = fork();
    if (pid < 0)
        return ChildProcess();
    if (pid == 0) {
        readEnd.Reset();
        int status = 1;
        try {
            status = work(writeEnd.Get());
        } catch (...) {
            // The parent learns of the failure from the exit status; nothing may unwind here.
        }
        _exit(status);
    }
    output = std::move(readEnd);
    return ChildProcess(pid);
}

int ChildProcess::Wait() {
    if (pid_ <= 0)
        return -1;
    int status = 0;
    pid_t ended;
    do
        ended = waitpid(pid_, &status, 0);
    while (ended < 0 && errno == EINTR);
    pid_ = -1;
    if (ended < 0 || !WIFEXITED(status))
        return -1;
    return WEXITSTATUS(status);
}

void ChildProcess::Kill() {
    if (pid_ <= 0)
        return;
    kill(pid_, SIGKILL);
    Wait();
}

}  // namespace harmona::io
