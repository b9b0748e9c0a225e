// The server's change of user: it answers no request as root.
#pragma once

namespace harmona::mediad {

inline constexpr const char* kUnprivilegedUser = "nobody";

// Gives up root for good: supplementary groups, group, user (kUnprivilegedUser, or uid and gid
// 65534 when the system has no such user). True at once when the process is not root (a
// developer's run); false when a step fails, and the process must not go on serving then.
bool DropRoot();

}  // namespace harmona::mediad
