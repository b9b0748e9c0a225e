#include "services/harmona-mediad/PidFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>

#include "common/io/FileDescriptor.h"
#include "common/io/ReplaceFile.h"
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
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
    const std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
    if (slash != std::string::npos)
        MakeDirs(folder);
    const io::FileDescriptor dir(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!dir)
        return false;
    // Readable by all: whoever looks for the running server reads it.
    return io::ReplaceFileAt(dir.Get(), name.c_str(), std::to_string(getpid()) + "\n",
                             "." + name + ".", {0644}) == io::ReplaceOutcome::ok;
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
