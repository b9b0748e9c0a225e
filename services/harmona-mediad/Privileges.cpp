#include "services/harmona-mediad/Privileges.h"

#include <grp.h>
#include <pwd.h>
#include <unistd.h>

namespace harmona::mediad {
namespace {

constexpr uid_t kFallbackUid = 65534;
constexpr gid_t kFallbackGid = 65534;

}  // namespace

bool DropRoot() {
    if (geteuid() != 0)
        return true;  // started unprivileged already (a developer's run)
    uid_t uid = kFallbackUid;
    gid_t gid = kFallbackGid;
    if (const passwd* user = getpwnam(kUnprivilegedUser)) {
        uid = user->pw_uid;
        gid = user->pw_gid;
    }
    if (setgroups(0, nullptr) != 0 || setgid(gid) != 0 || setuid(uid) != 0)
        return false;
    return setuid(0) != 0;  // root must be gone for good
}

}  // namespace harmona::mediad
