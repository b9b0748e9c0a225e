// The accounts Harmona's services run as. The audio daemon runs as its own account once it has
// opened its control socket, and that account owns the socket and listens on it: the CGI's daemon
// client talks only to a listener of this account (or root). The media server, its live library
// and the indexer run as the library's account, which owns library.db.
// There is no fallback: a host without an account is a start failure, never a run as a shared
// account such as "nobody", whose other processes could then pose as ours.
#pragma once

#include <pwd.h>
#include <sys/types.h>

namespace harmona::paths {

inline constexpr const char* kDaemonUser = "vanuaudiod";
inline constexpr const char* kLibraryUser = "harmona";
// The group of the control socket (mode 0660): the web server's, so that the CGI may connect.
inline constexpr const char* kDaemonSocketGroup = "www-data";

// The uid and primary group of account `name`; false when the system has no such account.
inline bool LookUpAccount(const char* name, uid_t& uid, gid_t& gid) {
    if (const passwd* entry = getpwnam(name)) {
        uid = entry->pw_uid;
        gid = entry->pw_gid;
        return true;
    }
    return false;
}

// The daemon's account (uid and primary group); false when it does not exist.
inline bool LookUpDaemonAccount(uid_t& uid, gid_t& gid) {
    return LookUpAccount(kDaemonUser, uid, gid);
}

}  // namespace harmona::paths
