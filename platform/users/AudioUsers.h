// The audio users of users.conf: one section per user name
// (platform/README.md, "Requests, users and permissions").
#pragma once

#include <string>

class AudioUsers {
  public:
    // The `permission` key of the user's section: a decimal signed 32-bit number; 0 when the file,
    // the section or the key is missing, or the value is not a whole decimal number.
    static int GetUserPermission(const std::string& user);

    // The `language` key of the user's section, as written; empty when missing.
    static std::string GetUserLanguage(const std::string& user);
};

namespace harmona::users {
// Parses a whole decimal signed 32-bit number ("-12", "+7", "42"); false for anything else.
bool ParseInt32(const std::string& text, int& value);
}  // namespace harmona::users
