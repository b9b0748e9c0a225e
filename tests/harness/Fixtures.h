// Writers of the fixtures that tests put into the sandbox's fixed paths (platform.md section 1).
#pragma once

#include <map>
#include <string>

namespace harmona::test {

// Paths of platform.md section 1.
inline constexpr const char* kTextsDir = "/var/packages/Harmona/target/app/texts/";
inline constexpr const char* kUsersConf = "/var/packages/Harmona/etc/users.conf";
inline constexpr const char* kAudioConf = "/var/packages/Harmona/etc/audio.conf";
inline constexpr const char* kPreferenceRoot = "/usr/vanu/etc/preference/";

void MakeDirs(const std::string& path);
// Creates the parent folders, then writes the file whole.
void WriteFile(const std::string& path, const std::string& content, unsigned mode = 0644);
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

// The common base of a served request: the texts installed and "admin" with every permission bit.
void StandardFixture();

}  // namespace harmona::test
