// The device harmona-mediad announces: a MediaServer:1 root device with ContentDirectory:1 and
// ConnectionManager:1. GUPnP serves the description and the service descriptions (SCPDs) from a
// folder of files, so they are written once at start into a private folder.
#pragma once

#include <string>

namespace harmona::mediad {

inline constexpr const char* kMediaServerType = "urn:schemas-upnp-org:device:MediaServer:1";
inline constexpr const char* kContentDirectoryType =
    "urn:schemas-upnp-org:service:ContentDirectory:1";
inline constexpr const char* kConnectionManagerType =
    "urn:schemas-upnp-org:service:ConnectionManager:1";
inline constexpr const char* kDescriptionFile = "description.xml";

// A stable device id: from the machine id when there is one, so that players keep their place
// across restarts.
std::string MakeUdn();

// The root device description (GUPnP adds the location; relative URLs resolve against it).
std::string DeviceDescription(const std::string& udn, const std::string& friendlyName);

// "Harmona Music Library (<host name>)".
std::string DefaultFriendlyName();

// Writes the description and both SCPDs into `folder` (created 0755, files 0644, so that the
// service still reads them after it dropped root). False with `error` set when it cannot.
bool WriteDescriptionFolder(const std::string& folder, const std::string& udn, std::string& error);

// Removes what WriteDescriptionFolder wrote, and the folder.
void RemoveDescriptionFolder(const std::string& folder);

}  // namespace harmona::mediad
