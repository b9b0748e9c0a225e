#include "services/harmona-mediad/Privileges.h"

#include <grp.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "platform/paths/DaemonAccount.h"

namespace harmona::mediad {

bool DropRoot(std::string& error) {
    if (geteuid() != 0)
        return true;  // started unprivileged already
    uid_t uid = 0;
    gid_t gid = 0;
    if (!paths::LookUpAccount(paths::kLibraryUser, uid, gid)) {
        error = std::string("the account ") + paths::kLibraryUser +
                " does not exist; not serving as root or as any other account";
        return false;
    }
    if (setgroups(0, nullptr) != 0 || setgid(gid) != 0 || setuid(uid) != 0) {
        error = std::string("cannot change to user ") + paths::kLibraryUser + ": " +
                std::strerror(errno);
        return false;
    }
    if (setuid(0) == 0) {  // root must be gone for good
        error = "root could be taken back after the change of user";
        return false;
    }
    return true;
}

}  // namespace harmona::mediad
