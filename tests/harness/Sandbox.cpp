#include "tests/harness/Sandbox.h"

#include <fcntl.h>
#include <net/if.h>
#include <pwd.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <thread>

#ifndef HARMONA_KEEP_PATHS
#define HARMONA_KEEP_PATHS ""
#endif

namespace harmona::test {
namespace {

[[noreturn]] void Die(const std::string& what) {
    std::fprintf(stderr, "sandbox: %s: %s\n", what.c_str(), std::strerror(errno));
    std::fprintf(stderr, "sandbox: the tests need root and unshare(CLONE_NEWNS|CLONE_NEWNET)\n");
    std::_Exit(77);
}

void Check(int rc, const std::string& what) {
    if (rc != 0)
        Die(what);
}

void MakeDirs(const std::string& path) {
    std::string partial;
    for (std::size_t i = 1; i <= path.size(); ++i) {
        if (i == path.size() || path[i] == '/') {
            partial = path.substr(0, i);
            if (mkdir(partial.c_str(), 0755) != 0 && errno != EEXIST)
                Die("mkdir " + partial);
        }
    }
}

bool IsUnder(const std::string& path, const std::string& root) {
    return path == root || (path.size() > root.size() && path.compare(0, root.size(), root) == 0 &&
                            path[root.size()] == '/');
}

// A path that must stay visible inside the sandbox, held open before the roots were covered.
struct KeptPath {
    std::string path;
    int fd;
};
std::vector<KeptPath>& KeptPaths() {
    static std::vector<KeptPath> kept;
    return kept;
}

bool entered = false;
int syslogFd = -1;
std::vector<LogLine> pendingLines;
// A running system's services log while the test works (Stack.h drains the socket from a thread of
// its own), so the pending lines are shared.
std::mutex pendingMutex;

void BringLoopbackUp() {
    const int s = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    if (s < 0)
        Die("socket for loopback");
    struct ifreq ifr {};
    std::strncpy(ifr.ifr_name, "lo", IFNAMSIZ - 1);
    Check(ioctl(s, SIOCGIFFLAGS, &ifr), "SIOCGIFFLAGS lo");
    ifr.ifr_flags |= IFF_UP | IFF_RUNNING;
    Check(ioctl(s, SIOCSIFFLAGS, &ifr), "SIOCSIFFLAGS lo");
    close(s);
}

// /dev gets a tmpfs of its own holding the ordinary device nodes (bound from the real /dev) and
// our /dev/log socket; the machine may have no /dev/log at all, and its own must not be touched.
void PrivateDev() {
    const int realDev = open("/dev", O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (realDev < 0)
        Die("open /dev");
    Check(mount("tmpfs", "/dev", "tmpfs", MS_NOSUID, "mode=755"), "mount tmpfs /dev");
    for (const char* node : {"null", "zero", "full", "random", "urandom", "tty"}) {
        const std::string target = std::string("/dev/") + node;
        const int fd = open(target.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0666);
        if (fd < 0)
            Die("create " + target);
        close(fd);
        const std::string source = "/proc/self/fd/" + std::to_string(realDev) + "/" + node;
        Check(mount(source.c_str(), target.c_str(), nullptr, MS_BIND, nullptr), "bind " + target);
    }
    Check(symlink("/proc/self/fd", "/dev/fd"), "symlink /dev/fd");
    Check(symlink("/proc/self/fd/0", "/dev/stdin"), "symlink /dev/stdin");
    Check(symlink("/proc/self/fd/1", "/dev/stdout"), "symlink /dev/stdout");
    Check(symlink("/proc/self/fd/2", "/dev/stderr"), "symlink /dev/stderr");
    MakeDirs("/dev/shm");
    Check(mount("tmpfs", "/dev/shm", "tmpfs", MS_NOSUID | MS_NODEV, "mode=1777"), "mount /dev/shm");
    close(realDev);
}

void OpenSyslogCatcher() {
    if (syslogFd >= 0)
        close(syslogFd);
    unlink("/dev/log");
    syslogFd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (syslogFd < 0)
        Die("socket /dev/log");
    struct sockaddr_un addr {};
    addr.sun_family = AF_UNIX;
    std::strncpy(addr.sun_path, "/dev/log", sizeof(addr.sun_path) - 1);
    Check(bind(syslogFd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)), "bind /dev/log");
    chmod("/dev/log", 0666);
    int size = 4 << 20;
    setsockopt(syslogFd, SOL_SOCKET, SO_RCVBUF, &size, sizeof(size));
    std::lock_guard<std::mutex> lock(pendingMutex);
    pendingLines.clear();
}

// "<11>Nov 23 11:00:00 audiotree.cgi: text" or "<11>Nov 23 11:00:00 audiotree.cgi[42]: text".
LogLine ParseDatagram(const std::string& raw) {
    LogLine line;
    line.raw = raw;
    std::string rest = raw;
    if (!rest.empty() && rest[0] == '<') {
        const std::size_t close = rest.find('>');
        if (close != std::string::npos) {
            line.priority = std::atoi(rest.substr(1, close - 1).c_str());
            rest = rest.substr(close + 1);
        }
    }
    // The timestamp is 15 characters and a space ("Nov 23 11:00:00 ").
    if (rest.size() > 16)
        rest = rest.substr(16);
    const std::size_t colon = rest.find(": ");
    line.message = colon == std::string::npos ? rest : rest.substr(colon + 2);
    while (!line.message.empty() && (line.message.back() == '\n' || line.message.back() == '\0'))
        line.message.pop_back();
    return line;
}

// The services' own accounts, as a package installs them: "harmona" (the library's) and
// "vanuaudiod" (the audio daemon's). The programs never fall back to another account, so where
// this machine lacks them they are added to copies of the account files that only this mount
// namespace sees: written to a tmpfs of its own (over /run, which every test covers anew) and
// bound over /etc/passwd and /etc/group, which keeps them after that tmpfs is gone.
void BindWithLines(const std::string& copy, const char* file, const std::string& lines) {
    std::string text;
    if (FILE* in = std::fopen(file, "re")) {
        char buffer[4096];
        std::size_t n = 0;
        while ((n = std::fread(buffer, 1, sizeof(buffer), in)) > 0)
            text.append(buffer, n);
        std::fclose(in);
    }
    if (!text.empty() && text.back() != '\n')
        text += '\n';
    text += lines;
    FILE* out = std::fopen(copy.c_str(), "we");
    if (out == nullptr || std::fwrite(text.data(), 1, text.size(), out) != text.size() ||
        std::fclose(out) != 0)
        Die("copy of " + std::string(file));
    chmod(copy.c_str(), 0644);
    Check(mount(copy.c_str(), file, nullptr, MS_BIND, nullptr), std::string("bind ") + file);
}

void ServiceAccounts() {
    struct Account {
        const char* name;
        unsigned id;
    };
    std::string passwd;
    std::string group;
    for (const Account& account : {Account{"harmona", 64980}, Account{"vanuaudiod", 64990}}) {
        if (getpwnam(account.name) != nullptr)
            continue;
        const std::string id = std::to_string(account.id);
        passwd += std::string(account.name) + ":x:" + id + ":" + id +
                  "::/nonexistent:/usr/sbin/nologin\n";
        group += std::string(account.name) + ":x:" + id + ":\n";
    }
    if (passwd.empty())
        return;
    Check(mount("tmpfs", "/run", "tmpfs", 0, "mode=755,size=1m"), "mount tmpfs for accounts");
    BindWithLines("/run/passwd", "/etc/passwd", passwd);
    BindWithLines("/run/group", "/etc/group", group);
}

}  // namespace

const std::vector<std::string>& SandboxRoots() {
    static const std::vector<std::string> roots = {"/var/packages", "/usr/vanu", "/tmp", "/run",
                                                   "/volume1"};
    return roots;
}

void EnterSandbox() {
    if (entered)
        return;
    if (geteuid() != 0) {
        errno = EPERM;
        Die("not running as root");
    }
    // Hold the kept paths open before anything is covered.
    std::string keep = HARMONA_KEEP_PATHS;
    for (std::size_t start = 0; start < keep.size();) {
        std::size_t end = keep.find(':', start);
        if (end == std::string::npos)
            end = keep.size();
        const std::string path = keep.substr(start, end - start);
        start = end + 1;
        if (path.empty())
            continue;
        const int fd = open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
        if (fd >= 0)
            KeptPaths().push_back({path, fd});
    }
    Check(unshare(CLONE_NEWNS | CLONE_NEWNET), "unshare");
    Check(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), "make / private");
    BringLoopbackUp();
    PrivateDev();
    ServiceAccounts();
    entered = true;
    ResetSandbox();
}

void ResetSandbox() {
    for (const std::string& root : SandboxRoots()) {
        umount2(root.c_str(), MNT_DETACH);  // the previous test's tmpfs, if any
        // The mount point itself: on the real machine only when it is missing (an empty folder).
        MakeDirs(root);
        Check(mount("tmpfs", root.c_str(), "tmpfs", 0, "mode=755,size=2g"), "mount tmpfs " + root);
        if (root == "/tmp")
            chmod("/tmp", 01777);
        for (const KeptPath& kept : KeptPaths()) {
            if (!IsUnder(kept.path, root))
                continue;
            MakeDirs(kept.path);
            const std::string source = "/proc/self/fd/" + std::to_string(kept.fd);
            Check(mount(source.c_str(), kept.path.c_str(), nullptr, MS_BIND | MS_REC, nullptr),
                  "bind kept " + kept.path);
        }
    }
    OpenSyslogCatcher();
}

int SyslogSocket() {
    return syslogFd;
}

void DrainSyslog() {
    std::lock_guard<std::mutex> lock(pendingMutex);
    char buffer[65536];
    for (;;) {
        const ssize_t n = recv(syslogFd, buffer, sizeof(buffer), MSG_DONTWAIT);
        if (n < 0)
            break;
        pendingLines.push_back(ParseDatagram(std::string(buffer, static_cast<std::size_t>(n))));
    }
}

std::vector<LogLine> TakeLogLines(int settleMs) {
    if (settleMs > 0)
        std::this_thread::sleep_for(std::chrono::milliseconds(settleMs));
    DrainSyslog();
    std::vector<LogLine> lines;
    std::lock_guard<std::mutex> lock(pendingMutex);
    lines.swap(pendingLines);
    return lines;
}

}  // namespace harmona::test
