#include "services/harmona-mediad/PidFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>

#include "common/io/FileDescriptor.h"
#include "platform/paths/PlatformPaths.h"

namespace harmona::mediad {
namespace {

constexpr int kServiceNumber = paths::kLocalMediaServerService;

void MakeDirs(const std::string& dir) {
    for (std::size_t i = 1; i <= dir.size(); ++i) {
        if (i == dir.size() || dir[i] == '/')
            mkdir(dir.substr(0, i).c_str(), 0755);
    }
}

}  // namespace

std::string PidFilePath() {
    return std::string(paths::kServicePidDir) + std::to_string(kServiceNumber) + ".pid";
}

bool WritePidFile(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash != std::string::npos)
        MakeDirs(path.substr(0, slash + 1));
    const std::string temporary = path + ".tmp";
    unlink(temporary.c_str());
    io::FileDescriptor fd(
        open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!fd)
        return false;
    const std::string text = std::to_string(getpid()) + "\n";
    const bool written =
        write(fd.Get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
    if (!fd.Close() || !written || rename(temporary.c_str(), path.c_str()) != 0) {
        unlink(temporary.c_str());
        return false;
    }
    return true;
}

void RemovePidFile(const std::string& path) {
    char buffer[32] = {};
    const io::FileDescriptor fd(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (!fd)
        return;
    const ssize_t got = read(fd.Get(), buffer, sizeof(buffer) - 1);
    if (got > 0 && std::atol(buffer) == static_cast<long>(getpid()))
        unlink(path.c_str());
}

}  // namespace harmona::mediad
