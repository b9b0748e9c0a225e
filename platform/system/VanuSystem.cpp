#include "platform/system/VanuSystem.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <cstring>
#include <string>

#include "common/io/FileDescriptor.h"
#include "platform/conf/ConfFile.h"
#include "platform/paths/PlatformPaths.h"

int VANUAudioConfGet(const char* key, char* buffer, int size) {
    if (key == nullptr || buffer == nullptr || size < 1)
        return -1;
    harmona::conf::ReadResult result;
    const auto value =
        harmona::conf::LookupConf(harmona::paths::kAudioConf, std::nullopt, key, &result);
    if (result == harmona::conf::ReadResult::unreadable)
        return -1;
    if (!value || value->empty())
        return 0;
    const std::size_t keep = std::min(value->size(), static_cast<std::size_t>(size) - 1);
    std::memcpy(buffer, value->data(), keep);
    buffer[keep] = '\0';
    return value->size() > 0x7fffffff ? 0x7fffffff : static_cast<int>(value->size());
}

int VANUAudioHasShare() {
    char path[4096];
    const char* share = harmona::paths::kDefaultAudioShare;
    // A value cut to the buffer would name another folder: only a whole value counts.
    const int length = VANUAudioConfGet("audio_share_path", path, sizeof(path));
    if (length > 0 && length < static_cast<int>(sizeof(path)))
        share = path;
    struct stat st {};
    return stat(share, &st) == 0 && S_ISDIR(st.st_mode) ? 1 : 0;
}

int VANUServiceStatusGet(int service) {
    if (service < 1 || service > 64)
        return -1;
    const std::string path = harmona::paths::kServicePidDir + std::to_string(service) + ".pid";
    const harmona::io::FileDescriptor fd(
        open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (!fd)
        return 0;
    char text[32] = {};
    struct stat st {};
    ssize_t n = -1;
    if (fstat(fd.Get(), &st) == 0 && S_ISREG(st.st_mode))
        n = read(fd.Get(), text, sizeof(text) - 1);
    if (n <= 0)
        return 0;
    text[n] = '\0';
    // A decimal pid, optionally followed by white space (a newline).
    long pid = 0;
    int i = 0;
    for (; text[i] >= '0' && text[i] <= '9'; ++i) {
        pid = pid * 10 + (text[i] - '0');
        if (pid > 0x3fffffff)
            return 0;
    }
    if (i == 0 || pid <= 0)
        return 0;
    for (; text[i] != '\0'; ++i) {
        if (!std::isspace(static_cast<unsigned char>(text[i])))
            return 0;
    }
    return kill(static_cast<pid_t>(pid), 0) == 0 || errno == EPERM ? 1 : 0;
}

int CORXFileExist(const char* path) {
    struct stat st {};
    return path != nullptr && stat(path, &st) == 0 ? 1 : 0;
}

int CORXStrTrimSpace(char* text, int /*option*/) {
    if (text == nullptr)
        return -1;
    std::size_t length = std::strlen(text);
    while (length > 0 && std::isspace(static_cast<unsigned char>(text[length - 1])))
        --length;
    text[length] = '\0';
    std::size_t start = 0;
    while (start < length && std::isspace(static_cast<unsigned char>(text[start])))
        ++start;
    if (start > 0)
        std::memmove(text, text + start, length - start + 1);
    return 0;
}
