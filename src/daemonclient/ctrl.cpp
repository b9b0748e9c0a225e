// Unit ctrl of the audio daemon client: the connection to the daemon's control socket, the
// request/reply exchange, and the equalizer profile lookup.
#include <sys/select.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include <sys/stat.h>

#include "common/io/FileDescriptor.h"
#include "platform/paths/DaemonAccount.h"
#include "platform/paths/PlatformPaths.h"
#include "platform/system/VanuSystem.h"
#include "src/daemonclient/AudioDaemon.h"

namespace {

// The unit name and line numbers of this unit's log lines: fixed identifiers that log readers match
// on, not source lines, so they must not follow the code when it moves.
constexpr const char* kUnit = "ctrl";
constexpr int kLineConnectFailed = 27;
constexpr int kLineBadParameter = 46;
constexpr int kLineUnwritable = 69;
constexpr int kLineSendFailed = 74;
constexpr int kLineReadFailed = 90;
constexpr int kLineIllegalProfile = 546;
constexpr int kLineTrimFailed = 552;
constexpr int kLineSystemProfileFailed = 603;

// The two waits of one exchange (writable, then readable) share this budget.
constexpr long kBudgetMicroseconds = 500000;

// Lines of a profile file are read with a buffer of this size.
constexpr int kProfileLineSize = 1024;
// Configuration values are read into buffers of this size.
constexpr int kConfValueSize = 1024;

// Waits until `fd` is writable (forWrite) or readable, lowering `budget` by the time waited (Linux
// select does that). Returns select's result; 1 with the descriptor in the set is ready.
int WaitFor(int fd, bool forWrite, timeval* budget, bool* ready) {
    fd_set set;
    FD_ZERO(&set);
    FD_SET(fd, &set);
    const int result = forWrite ? select(fd + 1, nullptr, &set, nullptr, budget)
                                : select(fd + 1, &set, nullptr, nullptr, budget);
    *ready = result > 0 && FD_ISSET(fd, &set);
    return result;
}

// The exchange on a connected socket: wait until writable, write the record, wait until readable,
// read one reply. The caller closes the socket.
int Exchange(int fd, const AudioDaemonRequest* request, char* reply, int replySize) {
    // select() cannot watch a descriptor beyond FD_SETSIZE; such a socket cannot be used.
    if (fd >= FD_SETSIZE)
        return -1;
    timeval budget{0, kBudgetMicroseconds};
    bool ready = false;
    if (WaitFor(fd, true, &budget, &ready) <= 0)
        return -1;  // time-out or error: silent
    if (!ready) {
        syslog(LOG_ERR, "%s:%d socket is unwritable", kUnit, kLineUnwritable);
        return -1;
    }
    // One write of the whole record, no loop for partial writes. send() with MSG_NOSIGNAL is that
    // write without the SIGPIPE that a daemon closing early would otherwise kill the program with.
    const ssize_t sent = send(fd, request, sizeof(AudioDaemonRequest), MSG_NOSIGNAL);
    if (sent != static_cast<ssize_t>(sizeof(AudioDaemonRequest))) {
        syslog(LOG_ERR, "%s:%d Failed to send command.", kUnit, kLineSendFailed);
        return -1;
    }
    // The same time value again, not reset: the reply must come within what is left of it.
    if (WaitFor(fd, false, &budget, &ready) <= 0 || !ready)
        return -1;  // time-out or error: silent
    std::memset(reply, 0, static_cast<size_t>(replySize));
    const ssize_t received = read(fd, reply, static_cast<size_t>(replySize));
    if (received < 1) {
        syslog(LOG_ERR, "%s:%d Failed to read action [%m]", kUnit, kLineReadFailed);
        return -1;
    }
    return 0;
}

}  // namespace

namespace {

// The socket lives in world-writable /tmp: only one that root or the daemon's account made is
// the daemon's; any other local user could have put one there to answer in its place.
bool OwnedByTheDaemon(const char* path) {
    struct stat info {};
    if (lstat(path, &info) != 0 || !S_ISSOCK(info.st_mode))
        return true;  // nothing there (or no socket): the connect fails and says so
    if (info.st_uid == 0)
        return true;
    uid_t daemonUid = 0;
    gid_t daemonGid = 0;
    return harmona::paths::LookUpDaemonAccount(daemonUid, daemonGid) && info.st_uid == daemonUid;
}

// The file's owner says who made the socket, not who listens on it now: between the look and the
// connect another user may put a socket of their own in its place, or one may sit at the path
// while its owner is not the listener. The kernel's word on the connected peer (the listener's
// credentials, SO_PEERCRED) decides: root or the daemon's own account, and no other.
bool ListenerIsTheDaemon(int fd) {
    ucred peer{};
    socklen_t size = sizeof(peer);
    if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0 || size != sizeof(peer))
        return false;
    if (peer.uid == 0)
        return true;
    uid_t daemonUid = 0;
    gid_t daemonGid = 0;
    return harmona::paths::LookUpDaemonAccount(daemonUid, daemonGid) && peer.uid == daemonUid;
}

}  // namespace

int AudioDaemonConnect() {
    // Non-blocking, so that a daemon whose listen queue is full fails the connect at once
    // instead of holding the request; the exchange waits with select() anyway.
    harmona::io::FileDescriptor fd(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
    if (!fd)
        return -1;
    sockaddr_un address;
    std::memset(&address, 0, sizeof(address));
    address.sun_family = AF_UNIX;
    std::snprintf(address.sun_path, sizeof(address.sun_path), "%s", harmona::paths::kDaemonSocket);
    if (!OwnedByTheDaemon(harmona::paths::kDaemonSocket)) {
        errno = EACCES;
        syslog(LOG_ERR, "%s:%d Failed to connect to %s. [%m]", kUnit, kLineConnectFailed,
               harmona::paths::kDaemonSocket);
        return -1;
    }
    if (connect(fd.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to connect to %s. [%m]", kUnit, kLineConnectFailed,
               harmona::paths::kDaemonSocket);
        return -1;
    }
    if (!ListenerIsTheDaemon(fd.Get())) {
        errno = EACCES;
        syslog(LOG_ERR, "%s:%d Failed to connect to %s. [%m]", kUnit, kLineConnectFailed,
               harmona::paths::kDaemonSocket);
        return -1;
    }
    return fd.Release();
}

int AudioDaemonCall(const AudioDaemonRequest* request, char* reply, int replySize) {
    if (reply == nullptr || replySize <= 0) {
        syslog(LOG_ERR, "%s:%d Bad parameter", kUnit, kLineBadParameter);
        return -1;
    }
    const int fd = AudioDaemonConnect();
    if (fd < 0)
        return -1;
    const int result = Exchange(fd, request, reply, replySize);
    // Only a descriptor above 0 is closed: a descriptor of 0 stays open, whoever owns it; pinned by
    // DaemonClient.DescriptorZeroIsNeverClosed.
    if (fd > 0)
        close(fd);
    return result;
}

int LoadEqualizerProfile(const char* path, const char* label, char* value, int size) {
    // Null pointers and sizes that the lookup below would dereference or overflow.
    if (path == nullptr || label == nullptr || value == nullptr || size <= 0)
        return -1;
    FILE* file = std::fopen(path, "re");
    if (file == nullptr)
        return -1;
    int result = 0;
    char line[kProfileLineSize];
    while (std::fgets(line, sizeof(line), file) != nullptr) {
        char* colon = std::strrchr(line, ':');
        if (colon == nullptr) {
            syslog(LOG_ERR, "%s:%d The EQ profile [%s] is illegal.", kUnit, kLineIllegalProfile,
                   line);
            result = -1;
            break;
        }
        // Compared over the line's label length only: a longer given label that begins with the
        // line's label matches too, and an empty label matches anything; pinned by
        // EqualizerProfile.LongerLabelBeginningWithTheLinesLabelMatchesToo and
        // EqualizerProfile.EmptyLabelOfALineMatchesAnyLabel.
        const size_t labelLength = static_cast<size_t>(colon - line);
        if (std::strncmp(line, label, labelLength) != 0)
            continue;
        std::snprintf(value, static_cast<size_t>(size), "%s", colon + 1);
        if (CORXStrTrimSpace(value, 0) < 0) {
            syslog(LOG_ERR, "%s:%d Failed to trim [%s].", kUnit, kLineTrimFailed, value);
            result = -1;
        } else {
            result = 1;
        }
        break;
    }
    std::fclose(file);
    return result;
}

int GetDefaultEqualizerProfile(char* value, int size) {
    char enabled[kConfValueSize];
    if (VANUAudioConfGet("audio_enable_equalizer", enabled, sizeof(enabled)) <= 0 ||
        std::strcmp(enabled, "yes") != 0)
        return 0;
    char label[kConfValueSize];
    if (VANUAudioConfGet("audio_default_equalizer", label, sizeof(label)) <= 0)
        return 0;
    const int system = LoadEqualizerProfile(harmona::paths::kEqualizerSystem, label, value, size);
    if (system < 0) {
        syslog(LOG_ERR, "%s:%d Failed to open the system EQ profile [%s].", kUnit,
               kLineSystemProfileFailed, harmona::paths::kEqualizerSystem);
        return system;
    }
    if (system == 0)
        return LoadEqualizerProfile(harmona::paths::kEqualizerUser, label, value, size);
    return 1;  // a system profile shadows a user profile of the same label
}
