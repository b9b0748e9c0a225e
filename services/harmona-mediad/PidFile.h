// The pid file by which the system's service list sees that the media server runs (service 3 of
// that list): written once 127.0.0.1 serves, removed when the server stops.
#pragma once

#include <string>

namespace harmona::mediad {

// /run/vanu/service/3.pid.
std::string PidFilePath();

// Writes this process's pid, whole under a temporary name and renamed, so that a reader never
// sees half a pid; creates the folder when needed. False when it cannot.
bool WritePidFile(const std::string& path);

// Removes the pid file only while it still names this process.
void RemovePidFile(const std::string& path);

}  // namespace harmona::mediad
