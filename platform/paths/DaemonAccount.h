// The account the audio daemon runs as once it has opened its control socket, and which owns
// that socket: the CGI's daemon client talks only to a socket owned by root or by this account.
// A host without the dedicated account uses "nobody", as the daemon itself then does.
#pragma once

#include <pwd.h>
#include <sys/types.h>

#include <initializer_list>

namespace harmona::paths {

inline constexpr const char* kDaemonUser = "vanuaudiod";
inline constexpr const char* kDaemonFallbackUser = "nobody";
// The group of the control socket (mode 0660): the web server's, so that the CGI may connect.
inline constexpr const char* kDaemonSocketGroup = "www-data";

// The daemon's account (uid and primary group); false when neither account exists.
inline bool LookUpDaemonAccount(uid_t& uid, gid_t& gid) {
    for (const char* name : {kDaemonUser, kDaemonFallbackUser}) {
        if (const passwd* entry = getpwnam(name)) {
            uid = entry->pw_uid;
            gid = entry->pw_gid;
            return true;
        }
    }
    return false;
}

}  // namespace harmona::paths
