// harmona-mediad: the storage server's local UPnP media server over library.db.
//   harmona-mediad [--interface NAME]
// It serves ContentDirectory:1 on port 50003 (the CGI connects to 127.0.0.1 there), writes
// /run/vanu/service/3.pid while it runs (service 3 of the system's service list is this server) and
// removes it on SIGTERM or SIGINT before it says byebye.
#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "LiveLibrary.h"
#include "MediaFiles.h"
#include "MediaServer.h"
#include "PlatformPaths.h"

namespace {

constexpr int kServiceNumber = 3;

std::string PidFilePath() {
    return std::string(harmona::paths::kServicePidDir) + std::to_string(kServiceNumber) + ".pid";
}

void MakeDirs(const std::string& dir) {
    for (std::size_t i = 1; i <= dir.size(); ++i) {
        if (i == dir.size() || dir[i] == '/')
            mkdir(dir.substr(0, i).c_str(), 0755);
    }
}

// Written whole under a temporary name and renamed, so that a reader never sees half a pid.
bool WritePidFile() {
    MakeDirs(harmona::paths::kServicePidDir);
    const std::string path = PidFilePath();
    const std::string temporary = path + ".tmp";
    unlink(temporary.c_str());
    const int fd =
        open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (fd < 0)
        return false;
    const std::string text = std::to_string(getpid()) + "\n";
    const bool written = write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    close(fd);
    if (!written || rename(temporary.c_str(), path.c_str()) != 0) {
        unlink(temporary.c_str());
        return false;
    }
    return true;
}

// Removes the pid file only while it still names this process.
void RemovePidFile() {
    const std::string path = PidFilePath();
    char buffer[32] = {};
    const int fd = open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
    if (fd < 0)
        return;
    const ssize_t got = read(fd, buffer, sizeof(buffer) - 1);
    close(fd);
    if (got > 0 && std::atol(buffer) == static_cast<long>(getpid()))
        unlink(path.c_str());
}

}  // namespace

int main(int argc, char** argv) {
    harmona::mediad::MediaServerOptions options;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--interface") == 0 && i + 1 < argc) {
            options.interfaceName = argv[++i];
        } else {
            std::fprintf(stderr, "usage: %s [--interface NAME]\n", argv[0]);
            return 2;
        }
    }
    // Every thread libupnp starts inherits this mask, so the signals reach sigwait below only.
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    sigaddset(&stopSignals, SIGTERM);
    sigaddset(&stopSignals, SIGINT);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);
    signal(SIGPIPE, SIG_IGN);
    openlog("harmona-mediad", LOG_PID, LOG_DAEMON);

    options.dbPath = harmona::paths::kLibraryDb;
    options.sharePath = harmona::medialib::AudioSharePath();
    harmona::mediad::MediaServer server;
    std::string error;
    if (!server.Start(options, &error)) {
        syslog(LOG_ERR, "cannot start: %s", error.c_str());
        std::fprintf(stderr, "harmona-mediad: %s\n", error.c_str());
        return 1;
    }
    if (!WritePidFile())
        syslog(LOG_ERR, "cannot write %s", PidFilePath().c_str());
    syslog(LOG_INFO, "serving %s on %s", options.sharePath.c_str(),
           server.contentDirectory()->mediaBaseUrl().c_str());
    // Files added, changed or removed in the share reach library.db, and so every Browse, within
    // seconds.
    harmona::mediad::LiveLibraryOptions live;
    live.sharePath = options.sharePath;
    live.dbPath = options.dbPath;
    // The changed library is loaded on the live library's thread, not by the next Browse.
    live.onIndexed = [&server](const harmona::index::IndexReport&) {
        server.contentDirectory()->SystemUpdateId();
    };
    harmona::mediad::LiveLibrary liveLibrary(live);
    if (!liveLibrary.Start(&error))
        syslog(LOG_ERR, "the library will not follow the share: %s", error.c_str());

    int received = 0;
    while (sigwait(&stopSignals, &received) != 0) {
    }
    liveLibrary.Stop();
    RemovePidFile();
    server.Stop();
    syslog(LOG_INFO, "stopped by signal %d", received);
    return 0;
}
