#include "services/harmona-mediad/DeviceDescription.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "common/util/XmlEscape.h"

namespace harmona::mediad {
namespace {

// The same escaping as the browse library's requests (platform/dma).
using harmona::util::XmlText;

constexpr const char* kContentDirectoryId = "urn:upnp-org:serviceId:ContentDirectory";
constexpr const char* kConnectionManagerId = "urn:upnp-org:serviceId:ConnectionManager";
constexpr const char* kContentDirectoryScpdFile = "ContentDirectory.xml";
constexpr const char* kConnectionManagerScpdFile = "ConnectionManager.xml";

inline constexpr const char* kContentDirectoryScpdPath = "/upnp/ContentDirectory.xml";
inline constexpr const char* kConnectionManagerScpdPath = "/upnp/ConnectionManager.xml";
inline constexpr const char* kSourceProtocols =
    "http-get:*:audio/mpeg:*,http-get:*:audio/mp4:*,http-get:*:audio/aac:*,"
    "http-get:*:audio/ogg:*,http-get:*:audio/flac:*,http-get:*:audio/wav:*,"
    "http-get:*:audio/aiff:*,http-get:*:audio/x-ms-wma:*,http-get:*:audio/ac3:*,"
    "http-get:*:audio/x-ape:*,http-get:*:audio/x-pn-realaudio:*";

inline constexpr const char* kContentDirectoryScpd = R"XML(<?xml version="1.0"?>
<scpd xmlns="urn:schemas-upnp-org:service-1-0">
<specVersion><major>1</major><minor>0</minor></specVersion>
<actionList>
<action><name>GetSearchCapabilities</name><argumentList>
<argument><name>SearchCaps</name><direction>out</direction><relatedStateVariable>SearchCapabilities</relatedStateVariable></argument>
</argumentList></action>
<action><name>GetSortCapabilities</name><argumentList>
<argument><name>SortCaps</name><direction>out</direction><relatedStateVariable>SortCapabilities</relatedStateVariable></argument>
</argumentList></action>
<action><name>GetSystemUpdateID</name><argumentList>
<argument><name>Id</name><direction>out</direction><relatedStateVariable>SystemUpdateID</relatedStateVariable></argument>
</argumentList></action>
<action><name>Browse</name><argumentList>
<argument><name>ObjectID</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_ObjectID</relatedStateVariable></argument>
<argument><name>BrowseFlag</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_BrowseFlag</relatedStateVariable></argument>
<argument><name>Filter</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_Filter</relatedStateVariable></argument>
<argument><name>StartingIndex</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_Index</relatedStateVariable></argument>
<argument><name>RequestedCount</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_Count</relatedStateVariable></argument>
<argument><name>SortCriteria</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_SortCriteria</relatedStateVariable></argument>
<argument><name>Result</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_Result</relatedStateVariable></argument>
<argument><name>NumberReturned</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_Count</relatedStateVariable></argument>
<argument><name>TotalMatches</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_Count</relatedStateVariable></argument>
<argument><name>UpdateID</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_UpdateID</relatedStateVariable></argument>
</argumentList></action>
</actionList>
<serviceStateTable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_ObjectID</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_Result</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_BrowseFlag</name><dataType>string</dataType>
<allowedValueList><allowedValue>BrowseMetadata</allowedValue><allowedValue>BrowseDirectChildren</allowedValue></allowedValueList></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_Filter</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_SortCriteria</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_Index</name><dataType>ui4</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_Count</name><dataType>ui4</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_UpdateID</name><dataType>ui4</dataType></stateVariable>
<stateVariable sendEvents="no"><name>SearchCapabilities</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>SortCapabilities</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="yes"><name>SystemUpdateID</name><dataType>ui4</dataType></stateVariable>
<stateVariable sendEvents="yes"><name>ContainerUpdateIDs</name><dataType>string</dataType></stateVariable>
</serviceStateTable>
</scpd>
)XML";

inline constexpr const char* kConnectionManagerScpd = R"XML(<?xml version="1.0"?>
<scpd xmlns="urn:schemas-upnp-org:service-1-0">
<specVersion><major>1</major><minor>0</minor></specVersion>
<actionList>
<action><name>GetProtocolInfo</name><argumentList>
<argument><name>Source</name><direction>out</direction><relatedStateVariable>SourceProtocolInfo</relatedStateVariable></argument>
<argument><name>Sink</name><direction>out</direction><relatedStateVariable>SinkProtocolInfo</relatedStateVariable></argument>
</argumentList></action>
<action><name>GetCurrentConnectionIDs</name><argumentList>
<argument><name>ConnectionIDs</name><direction>out</direction><relatedStateVariable>CurrentConnectionIDs</relatedStateVariable></argument>
</argumentList></action>
<action><name>GetCurrentConnectionInfo</name><argumentList>
<argument><name>ConnectionID</name><direction>in</direction><relatedStateVariable>A_ARG_TYPE_ConnectionID</relatedStateVariable></argument>
<argument><name>RcsID</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_RcsID</relatedStateVariable></argument>
<argument><name>AVTransportID</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_AVTransportID</relatedStateVariable></argument>
<argument><name>ProtocolInfo</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_ProtocolInfo</relatedStateVariable></argument>
<argument><name>PeerConnectionManager</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_ConnectionManager</relatedStateVariable></argument>
<argument><name>PeerConnectionID</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_ConnectionID</relatedStateVariable></argument>
<argument><name>Direction</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_Direction</relatedStateVariable></argument>
<argument><name>Status</name><direction>out</direction><relatedStateVariable>A_ARG_TYPE_ConnectionStatus</relatedStateVariable></argument>
</argumentList></action>
</actionList>
<serviceStateTable>
<stateVariable sendEvents="yes"><name>SourceProtocolInfo</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="yes"><name>SinkProtocolInfo</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="yes"><name>CurrentConnectionIDs</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_ConnectionStatus</name><dataType>string</dataType>
<allowedValueList><allowedValue>OK</allowedValue><allowedValue>ContentFormatMismatch</allowedValue><allowedValue>InsufficientBandwidth</allowedValue><allowedValue>UnreliableChannel</allowedValue><allowedValue>Unknown</allowedValue></allowedValueList></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_ConnectionManager</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_Direction</name><dataType>string</dataType>
<allowedValueList><allowedValue>Input</allowedValue><allowedValue>Output</allowedValue></allowedValueList></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_ProtocolInfo</name><dataType>string</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_ConnectionID</name><dataType>i4</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_AVTransportID</name><dataType>i4</dataType></stateVariable>
<stateVariable sendEvents="no"><name>A_ARG_TYPE_RcsID</name><dataType>i4</dataType></stateVariable>
</serviceStateTable>
</scpd>
)XML";

std::string ServiceElement(const char* type, const char* id, const char* scpd, const char* name) {
    return std::string("<service><serviceType>") + type + "</serviceType><serviceId>" + id +
           "</serviceId><SCPDURL>/" + scpd + "</SCPDURL><controlURL>/" + name +
           "/control</controlURL><eventSubURL>/" + name + "/event</eventSubURL></service>";
}

bool WriteWholeFile(const std::string& path, const std::string& text) {
    unlink(path.c_str());
    io::FileDescriptor fd(
        open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!fd)
        return false;
    const bool written =
        write(fd.Get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
    fchmod(fd.Get(), 0644);  // whatever the umask: the unprivileged server reads these
    return fd.Close() && written;
}

}  // namespace

std::string MakeUdn() {
    std::string hex;
    const io::FileDescriptor fd(open("/etc/machine-id", O_RDONLY | O_CLOEXEC));
    if (fd) {
        char buffer[64] = {};
        const ssize_t got = read(fd.Get(), buffer, sizeof(buffer) - 1);
        for (ssize_t i = 0; i < got; ++i) {
            if (std::isxdigit(static_cast<unsigned char>(buffer[i])))
                hex += static_cast<char>(std::tolower(static_cast<unsigned char>(buffer[i])));
        }
    }
    if (hex.size() < 32)
        hex = "4861726d6f6e614d6564696144000001";
    hex.replace(0, 8, "4861726d");  // "Harm": differs from other devices of the same machine
    return "uuid:" + hex.substr(0, 8) + "-" + hex.substr(8, 4) + "-" + hex.substr(12, 4) + "-" +
           hex.substr(16, 4) + "-" + hex.substr(20, 12);
}

std::string DefaultFriendlyName() {
    char name[256] = {};
    if (gethostname(name, sizeof(name) - 1) != 0 || name[0] == '\0')
        std::strcpy(name, "storage");
    return std::string("Harmona Music Library (") + name + ")";
}

std::string DeviceDescription(const std::string& udn, const std::string& friendlyName) {
    return "<?xml version=\"1.0\"?>\n"
           "<root xmlns=\"urn:schemas-upnp-org:device-1-0\">"
           "<specVersion><major>1</major><minor>0</minor></specVersion>"
           "<device><deviceType>" +
           std::string(kMediaServerType) + "</deviceType><friendlyName>" + XmlText(friendlyName) +
           "</friendlyName><manufacturer>Harmona</manufacturer>"
           "<modelDescription>Harmona music library</modelDescription>"
           "<modelName>harmona-mediad</modelName><modelNumber>1</modelNumber><UDN>" +
           udn + "</UDN><serviceList>" +
           ServiceElement(kContentDirectoryType, kContentDirectoryId, kContentDirectoryScpdFile,
                          "ContentDirectory") +
           ServiceElement(kConnectionManagerType, kConnectionManagerId, kConnectionManagerScpdFile,
                          "ConnectionManager") +
           "</serviceList></device></root>\n";
}

bool WriteDescriptionFolder(const std::string& folder, const std::string& udn, std::string& error) {
    if (mkdir(folder.c_str(), 0755) != 0 && errno != EEXIST) {
        error = "cannot create " + folder + ": " + std::strerror(errno);
        return false;
    }
    chmod(folder.c_str(), 0755);
    const std::string base = folder + "/";
    if (!WriteWholeFile(base + kDescriptionFile, DeviceDescription(udn, DefaultFriendlyName())) ||
        !WriteWholeFile(base + kContentDirectoryScpdFile, kContentDirectoryScpd) ||
        !WriteWholeFile(base + kConnectionManagerScpdFile, kConnectionManagerScpd)) {
        error = "cannot write the device description into " + folder;
        return false;
    }
    return true;
}

void RemoveDescriptionFolder(const std::string& folder) {
    for (const char* file :
         {kDescriptionFile, kContentDirectoryScpdFile, kConnectionManagerScpdFile})
        unlink((folder + "/" + file).c_str());
    rmdir(folder.c_str());
}

}  // namespace harmona::mediad
