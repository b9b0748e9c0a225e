// The device harmona-mediad announces: a MediaServer:1 root device with ContentDirectory:1 and
// ConnectionManager:1. Its descriptions are data files (installed under the package's share
// folder, and copied beside the program in a build tree): the device description, a template in
// which each start puts this machine's UDN and friendly name, and the two service descriptions
// (SCPDs), which GUPnP serves as they are from their folder.
#pragma once

#include <cstddef>
#include <string>

namespace harmona::mediad {

inline constexpr const char* kContentDirectoryType =
    "urn:schemas-upnp-org:service:ContentDirectory:1";
inline constexpr const char* kConnectionManagerType =
    "urn:schemas-upnp-org:service:ConnectionManager:1";

// The data folder's name beside the running program, and its files.
inline constexpr const char* kDataFolderBesideProgram = "harmona-mediad-data";
inline constexpr const char* kDescriptionTemplateFile = "description.xml";
inline constexpr const char* kServicesFolder = "services";
inline constexpr const char* kContentDirectoryScpdFile = "ContentDirectory.xml";
inline constexpr const char* kConnectionManagerScpdFile = "ConnectionManager.xml";
// Where the template marks the per-instance values.
inline constexpr const char* kUdnMark = "@UDN@";
inline constexpr const char* kFriendlyNameMark = "@FRIENDLY_NAME@";

// The data folder: the one beside the running program when it is there (a build tree, which never
// mixes its files with an installed package's), else the installed one.
std::string DescriptionDataFolder();

// A stable device id: from the machine id when there is one, so that players keep their place
// across restarts.
std::string MakeUdn();

// "Harmona Music Library (<host name>)".
std::string DefaultFriendlyName();

// The longest friendly name given to control points, in bytes: what they show in a list of devices.
inline constexpr std::size_t kMaxFriendlyNameBytes = 64;

// The name the owner chose (`--friendly-name`): printable UTF-8 (other bytes become spaces), blanks
// at either end dropped, cut to kMaxFriendlyNameBytes without splitting a character; the default
// name when nothing is left.
std::string ChosenFriendlyName(const std::string& configured);

// The device description of the template `templateText` for `udn` and `friendlyName` (escaped
// here). False with `error` set when the template lacks a mark or holds one twice.
bool FillDescription(const std::string& templateText, const std::string& udn,
                     const std::string& friendlyName, std::string& description, std::string& error);

// What GUPnP's root device is made of: the filled description (served at /<uuid>.xml) and the
// folder of the service descriptions (served at /).
struct DescriptionFiles {
    std::string descriptionPath;
    std::string servicesFolder;
};

// Reads the data folder `dataFolder` (every file must be there, readable and well-formed XML),
// fills in the template and writes it into `runFolder` (created 0755, the file 0644, so that the
// service still reads it after it dropped root). False with `error` naming the file at fault.
bool PrepareDescriptions(const std::string& dataFolder, const std::string& runFolder,
                         const std::string& udn, const std::string& friendlyName,
                         DescriptionFiles& files, std::string& error);

// Removes what PrepareDescriptions wrote, and the folder.
void RemoveDescriptionFolder(const std::string& runFolder);

}  // namespace harmona::mediad
