#include "common/io/ReplaceFile.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <random>
#include <string>

#include "common/io/FileDescriptor.h"
#include "common/io/WriteAll.h"

namespace harmona::io {
namespace {

constexpr int kAttempts = 16;  // an exclusive create that keeps meeting taken names gives up

std::string TemporaryName(std::string_view prefix, std::mt19937& random) {
    static constexpr char kLetters[] = "abcdefghijklmnopqrstuvwxyz0123456789";
    std::uniform_int_distribution<int> letter(0, sizeof kLetters - 2);
    std::string name(prefix);
    for (int i = 0; i < 12; ++i)
        name += kLetters[letter(random)];
    return name;
}

}  // namespace

ReplaceOutcome ReplaceFileAt(int dirFd, const char* name, std::string_view text,
                             std::string_view temporaryPrefix, const ReplaceOptions& options) {
    std::random_device seed;
    std::mt19937 random(seed());
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        const std::string temporary = TemporaryName(temporaryPrefix, random);
        FileDescriptor file(openat(dirFd, temporary.c_str(),
                                   O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                                   options.mode));
        if (!file) {
            if (errno == EEXIST)
                continue;
            return ReplaceOutcome::failed;
        }
        const bool written = fchmod(file.Get(), options.mode) == 0 && WriteAll(file.Get(), text) &&
                             fsync(file.Get()) == 0 && file.Close();
        int renamed = -1;
        if (written) {
            renamed = options.mustBeNew
                          ? renameat2(dirFd, temporary.c_str(), dirFd, name, RENAME_NOREPLACE)
                          : renameat(dirFd, temporary.c_str(), dirFd, name);
        }
        if (renamed != 0) {
            const int cause = errno;
            unlinkat(dirFd, temporary.c_str(), 0);
            errno = cause;
            return written && cause == EEXIST && options.mustBeNew ? ReplaceOutcome::exists
                                                                   : ReplaceOutcome::failed;
        }
        fsync(dirFd);
        return ReplaceOutcome::ok;
    }
    errno = EEXIST;
    return ReplaceOutcome::failed;
}

}  // namespace harmona::io
