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

namespace {

int ExitStatus(int waitStatus) {
    return WIFEXITED(waitStatus) ? WEXITSTATUS(waitStatus) : -1;
}

}  // namespace

int ChildProcess::Wait() {
    if (pid_ <= 0)
        return -1;
    int status = 0;
    pid_t ended;
    do
        ended = waitpid(pid_, &status, 0);
    while (ended < 0 && errno == EINTR);
    pid_ = -1;
    return ended < 0 ? -1 : ExitStatus(status);
}

bool ChildProcess::HasEnded(int& status) {
    if (pid_ <= 0)
        return false;
    int waitStatus = 0;
    const pid_t ended = waitpid(pid_, &waitStatus, WNOHANG);
    if (ended == 0 || (ended < 0 && errno == EINTR))
        return false;
    pid_ = -1;
    status = ended < 0 ? -1 : ExitStatus(waitStatus);
    return true;
}

int ChildProcess::Stop(int graceMs) {
    if (pid_ <= 0)
        return 0;
    kill(pid_, SIGTERM);
    constexpr int kPollMs = 10;
    int status = -1;
    for (int waited = 0; waited < graceMs; waited += kPollMs) {
        if (HasEnded(status))
            return status;
        usleep(kPollMs * 1000);
    }
    if (HasEnded(status))
        return status;
    Kill();
    return -1;
}

void ChildProcess::Kill() {
    if (pid_ <= 0)
        return;
    kill(pid_, SIGKILL);
    Wait();
}

}  // namespace harmona::io
