// The server's child process: the network side (MediaServer) on a GLib main loop, run as the
// unprivileged user, ended by SIGTERM or SIGINT with a byebye on every network, or by the end of
// the supervisor that started it.
#pragma once

#include "services/harmona-mediad/MediaServer.h"

namespace harmona::mediad {

// The whole life of the server's process; its exit status. It writes one byte to `readyFd` once
// 127.0.0.1 serves.
int RunServer(const MediaServerOptions& options, int readyFd);

}  // namespace harmona::mediad
