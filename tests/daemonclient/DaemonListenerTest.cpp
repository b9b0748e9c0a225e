// Who the daemon client talks to: the process listening on /tmp/vanuaudiod.sock must be root or the
// daemon's own account, whatever the socket file's owner says. A listener of another user, behind
// a socket file that passes for the daemon's, gets no request and the call fails with one log line.
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "src/daemonclient/AudioDaemon.h"
#include "tests/daemonclient/DaemonTestSupport.h"

using namespace harmona::test;

namespace {

constexpr const char* kSocket = "/tmp/vanuaudiod.sock";
constexpr uid_t kStranger = 12345;

// A listener forked off this test: it binds the socket as root (so the file is root's), becomes
// `listenerUid` and only then listens, so that the kernel records that user as the peer. It
// accepts one connection and writes, on its pipe, how many bytes of a request arrived.
class ForkedListener {
  public:
    explicit ForkedListener(uid_t listenerUid) {
        int ready[2];
        int report[2];
        if (pipe(ready) != 0 || pipe(report) != 0)
            return;
        pid_ = fork();
        if (pid_ == 0) {
            close(ready[0]);
            close(report[0]);
            Listen(listenerUid, ready[1], report[1]);
            _exit(0);
        }
        close(ready[1]);
        close(report[1]);
        report_ = report[0];
        char byte = 0;
        pollfd pfd{ready[0], POLLIN, 0};
        ready_ = poll(&pfd, 1, 5000) == 1 && read(ready[0], &byte, 1) == 1 && byte == 'r';
        close(ready[0]);
    }
    ~ForkedListener() {
        if (pid_ > 0) {
            kill(pid_, SIGKILL);
            waitpid(pid_, nullptr, 0);
        }
        if (report_ >= 0)
            close(report_);
        unlink(kSocket);
    }
    bool ready() const { return ready_; }
    // The bytes the listener received on its one connection; -1 when it reported nothing.
    long Received() {
        pollfd pfd{report_, POLLIN, 0};
        char text[32] = {};
        if (poll(&pfd, 1, 5000) != 1 || read(report_, text, sizeof(text) - 1) <= 0)
            return -1;
        return std::atol(text);
    }

  private:
    static void Listen(uid_t uid, int readyFd, int reportFd) {
        const int fd = socket(AF_UNIX, SOCK_STREAM, 0);
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::snprintf(address.sun_path, sizeof(address.sun_path), "%s", kSocket);
        if (fd < 0 || bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0 ||
            chmod(kSocket, 0666) != 0 || setresgid(uid, uid, uid) != 0 ||
            setresuid(uid, uid, uid) != 0 || listen(fd, 4) != 0)
            _exit(1);
        if (write(readyFd, "r", 1) != 1)
            _exit(1);
        long received = 0;
        pollfd pfd{fd, POLLIN, 0};
        if (poll(&pfd, 1, 3000) == 1) {
            const int connection = accept(fd, nullptr, nullptr);
            char buffer[9000];
            pollfd in{connection, POLLIN, 0};
            while (poll(&in, 1, 1000) == 1) {
                const ssize_t n = read(connection, buffer, sizeof(buffer));
                if (n <= 0)
                    break;
                received += n;
            }
        }
        const std::string text = std::to_string(received);
        if (write(reportFd, text.data(), text.size()) < 0)
            _exit(1);
    }

    pid_t pid_ = -1;
    int report_ = -1;
    bool ready_ = false;
};

class DaemonListener : public ::testing::Test {
  protected:
    void SetUp() override { TakeLogLines(); }
};

}  // namespace

TEST_F(DaemonListener, AListenerOfAnotherUserBehindARootOwnedSocketFileGetsNoRequest) {
    ForkedListener listener(kStranger);
    ASSERT_TRUE(listener.ready());
    char reply[64];
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), -1);
    EXPECT_EQ(listener.Received(), 0);
    EXPECT_EQ(LoggedMessages(),
              std::vector<std::string>{
                  "ctrl:27 Failed to connect to /tmp/vanuaudiod.sock. [Permission denied]"});
}

TEST_F(DaemonListener, ARootListenerGetsTheWholeRequest) {
    ForkedListener listener(0);
    ASSERT_TRUE(listener.ready());
    char reply[64];
    // It never answers: the call fails within its budget, silently, after the record went out.
    EXPECT_EQ(AudioDaemonGetMediaServerList(0, 10, reply, sizeof(reply)), -1);
    EXPECT_EQ(listener.Received(), 8196);
    EXPECT_TRUE(LoggedMessages().empty());
}
