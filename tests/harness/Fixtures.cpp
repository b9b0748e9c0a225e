#include "tests/harness/Fixtures.h"

#include <dirent.h>
#include <ftw.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

#ifndef HARMONA_SOURCE_DIR
#error "HARMONA_SOURCE_DIR must name the source tree"
#endif

namespace harmona::test {

void MakeDirs(const std::string& path) {
    for (std::size_t i = 1; i <= path.size(); ++i) {
        if (i == path.size() || path[i] == '/') {
            const std::string partial = path.substr(0, i);
            if (mkdir(partial.c_str(), 0755) != 0 && errno != EEXIST)
                throw std::runtime_error("mkdir " + partial + ": " + std::strerror(errno));
        }
    }
}

void WriteFile(const std::string& path, const std::string& content, unsigned mode) {
    const std::size_t slash = path.rfind('/');
    if (slash != std::string::npos && slash > 0)
        MakeDirs(path.substr(0, slash));
    {
        std::ofstream out(path, std::ios::binary | std::ios::trunc);
        if (!out)
            throw std::runtime_error("cannot write " + path);
        out << content;
    }
    chmod(path.c_str(), mode);
}

void WriteLargeFile(const std::string& path, const std::string& head, char fill, std::size_t count,
                    const std::string& tail) {
    WriteFile(path, head);
    std::ofstream out(path, std::ios::binary | std::ios::app);
    const std::string piece(1 << 20, fill);
    for (std::size_t left = count; left > 0;) {
        const std::size_t n = std::min(left, piece.size());
        out.write(piece.data(), static_cast<std::streamsize>(n));
        left -= n;
    }
    out << tail;
    if (!out)
        throw std::runtime_error("cannot write " + path);
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream content;
    content << in.rdbuf();
    return content.str();
}

bool Exists(const std::string& path) {
    struct stat st {};
    return lstat(path.c_str(), &st) == 0;
}

void InstallTexts() {
    const std::string source = std::string(HARMONA_SOURCE_DIR) + "/data/texts";
    DIR* dir = opendir(source.c_str());
    if (dir == nullptr)
        throw std::runtime_error("no shipped texts at " + source);
    while (dirent* entry = readdir(dir)) {
        const std::string lang = entry->d_name;
        if (lang == "." || lang == "..")
            continue;
        const std::string strings = source + "/" + lang + "/strings";
        if (Exists(strings))
            WriteFile(kTextsDir + lang + "/strings", ReadFile(strings));
    }
    closedir(dir);
}

void WriteUsersConf(const std::map<std::string, UserEntry>& users) {
    std::string conf = "# audio users\n";
    for (const auto& [name, entry] : users) {
        conf += "[" + name + "]\n";
        if (!entry.permission.empty())
            conf += "permission=" + entry.permission + "\n";
        if (!entry.language.empty())
            conf += "language=" + entry.language + "\n";
    }
    WriteFile(kUsersConf, conf);
}

void AddUser(const std::string& name, int permission, const std::string& language) {
    WriteUsersConf({{name, {std::to_string(permission), language}}});
}

namespace {

FileSnapshot* currentSnapshot = nullptr;

int RecordEntry(const char* path, const struct stat* st, int type, struct FTW*) {
    std::string entry = std::to_string(type) + " " + std::to_string(st->st_mode) + " " +
                        std::to_string(st->st_size) + " " + std::to_string(st->st_mtim.tv_sec) +
                        "." + std::to_string(st->st_mtim.tv_nsec);
    if (type == FTW_SL) {
        char target[4096];
        const ssize_t n = readlink(path, target, sizeof(target));
        if (n > 0)
            entry += " -> " + std::string(target, static_cast<std::size_t>(n));
    }
    (*currentSnapshot)[path] = entry;
    return 0;
}

}  // namespace

FileSnapshot Snapshot() {
    FileSnapshot snapshot;
    currentSnapshot = &snapshot;
    for (const char* root : {"/var/packages", "/usr/vanu", "/tmp", "/run", "/volume1"})
        nftw(root, RecordEntry, 32, FTW_PHYS | FTW_MOUNT);
    currentSnapshot = nullptr;
    return snapshot;
}

std::vector<std::string> ChangedPaths(const FileSnapshot& before, const FileSnapshot& after) {
    std::vector<std::string> changed;
    for (const auto& [path, entry] : before) {
        const auto it = after.find(path);
        if (it == after.end() || it->second != entry)
            changed.push_back(path);
    }
    for (const auto& [path, entry] : after) {
        if (before.count(path) == 0)
            changed.push_back(path);
    }
    return changed;
}

void StandardFixture() {
    InstallTexts();
    AddUser("admin", 1 | 4 | 8 | 16);
}

}  // namespace harmona::test
