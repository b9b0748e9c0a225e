#include "platform/users/AudioUsers.h"

#include <cstdint>

#include "platform/conf/ConfFile.h"
#include "platform/paths/PlatformPaths.h"

namespace harmona::users {

bool ParseInt32(const std::string& text, int& value) {
    std::size_t i = 0;
    bool negative = false;
    if (i < text.size() && (text[i] == '-' || text[i] == '+'))
        negative = text[i++] == '-';
    if (i == text.size())
        return false;
    std::int64_t result = 0;
    for (; i < text.size(); ++i) {
        if (text[i] < '0' || text[i] > '9')
            return false;
        result = result * 10 + (text[i] - '0');
        if (result > static_cast<std::int64_t>(INT32_MAX) + 1)
            return false;
    }
    if (negative)
        result = -result;
    if (result < INT32_MIN || result > INT32_MAX)
        return false;
    value = static_cast<int>(result);
    return true;
}

}  // namespace harmona::users

int AudioUsers::GetUserPermission(const std::string& user) {
    const auto value = harmona::conf::LookupConf(harmona::paths::kUsersConf, user, "permission");
    int permission = 0;
    if (!value || !harmona::users::ParseInt32(*value, permission))
        return 0;
    return permission;
}

std::string AudioUsers::GetUserLanguage(const std::string& user) {
    return harmona::conf::LookupConf(harmona::paths::kUsersConf, user, "language").value_or("");
}
