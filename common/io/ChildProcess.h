// Move-only owner of a forked child process: a child that its owner lets go of unfinished is
// killed and reaped, so that no request leaves a process behind (a library call that never
// returns runs in such a child), and a service's supervisor restarts or stops its children.
#pragma once

#include <sys/types.h>

#include <functional>

#include "common/io/FileDescriptor.h"

namespace harmona::io {

class ChildProcess {
  public:
    ChildProcess() = default;
    ~ChildProcess() { Kill(); }
    ChildProcess(ChildProcess&& other) noexcept : pid_(other.pid_) { other.pid_ = -1; }
    ChildProcess& operator=(ChildProcess&& other) noexcept;
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // Forks; the child runs `work` with the write end of a pipe and ends with _exit(its result),
    // so that nothing of the parent's (stdio buffers, exit handlers) runs twice. `output` receives
    // the read end. An empty owner (and a closed `output`) when fork or pipe failed.
    static ChildProcess Start(const std::function<int(int writeFd)>& work, FileDescriptor& output);

    // The owner of a child that the caller forked itself (a test's helper process).
    static ChildProcess Adopt(pid_t pid) { return ChildProcess(pid); }

    explicit operator bool() const { return pid_ > 0; }
    // The child's process id (-1 when there is none): for signals other than Stop's and for its
    // entries under /proc.
    pid_t pid() const { return pid_; }

    // Waits for the child to end; its exit status, or -1 when it was ended by a signal.
    int Wait();

    // Whether the child has ended, without waiting; when it has, the owner is empty and `status`
    // holds its exit status (-1 when a signal ended it).
    bool HasEnded(int& status);

    // Asks the child to end (SIGTERM) and waits up to `graceMs` for it, then kills it (SIGKILL);
    // its exit status, -1 when a signal ended it, 0 when there was no child.
    int Stop(int graceMs);

    // Kills the child (SIGKILL) and reaps it; nothing when there is no child.
    void Kill();

  private:
    explicit ChildProcess(pid_t pid) : pid_(pid) {}
    pid_t pid_ = -1;
};

}  // namespace harmona::io
