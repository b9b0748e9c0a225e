// Writers of the fixtures that tests put into the sandbox's fixed paths.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace harmona::test {

// Fixed paths of the installed system (platform/README.md, "Fixed paths").
inline constexpr const char* kTextsDir = "/var/packages/Harmona/target/app/texts/";
inline constexpr const char* kUsersConf = "/var/packages/Harmona/etc/users.conf";
inline constexpr const char* kAudioConf = "/var/packages/Harmona/etc/audio.conf";
inline constexpr const char* kPreferenceRoot = "/usr/vanu/etc/preference/";

void MakeDirs(const std::string& path);
// Creates the parent folders, then writes the file whole.
void WriteFile(const std::string& path, const std::string& content, unsigned mode = 0644);
// Writes `head`, then `count` bytes of `fill`, then `tail`, in pieces (for files of many MiB).
void WriteLargeFile(const std::string& path, const std::string& head, char fill, std::size_t count,
                    const std::string& tail);
std::string ReadFile(const std::string& path);
bool Exists(const std::string& path);

// Copies the shipped UI text tables (data/texts/<lang>/strings) into the sandbox.
void InstallTexts();

struct UserEntry {
    std::string permission;  // the value as written; empty: the key is left out
    std::string language;    // empty: the key is left out
};
// Writes users.conf with one section per user.
void WriteUsersConf(const std::map<std::string, UserEntry>& users);
// users.conf with a single user.
void AddUser(const std::string& name, int permission, const std::string& language = "");

// What a file tree looks like: per path (symbolic links not followed) its type, mode, size,
// modification time and link target. Covers the sandbox roots, each within its own filesystem.
using FileSnapshot = std::map<std::string, std::string>;
FileSnapshot Snapshot();
// The paths that differ between two snapshots (added, removed or changed), in order.
std::vector<std::string> ChangedPaths(const FileSnapshot& before, const FileSnapshot& after);

// The common base of a served request: the texts installed and "admin" with every permission bit.
void StandardFixture();

}  // namespace harmona::test
