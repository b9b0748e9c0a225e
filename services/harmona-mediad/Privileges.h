// The server's change of user: it answers no request as root.
#pragma once

#include <string>

namespace harmona::mediad {

// Gives up root for good: supplementary groups, group, user (the library's account, "harmona").
// True at once when the process is not root (a developer's run, or a service manager that started
// it as the account already). False with `error` set when the account does not exist or a step
// fails; the process must not go on serving then, and never falls back to another account.
bool DropRoot(std::string& error);

}  // namespace harmona::mediad
