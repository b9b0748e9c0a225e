#include "MediaServer.h"
#include "SoapBrowse.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>
#include <upnp/ixml.h>
#include <upnp/upnp.h>
#include <upnp/upnptools.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "MediaFiles.h"
#include "SoapBrowse.h"

namespace harmona::mediad {
namespace {

// The same escaping as the browse library's requests (platform/dma).
using harmona::dma::XmlEscape;

constexpr const char* kContentDirectoryType = "urn:schemas-upnp-org:service:ContentDirectory:1";
constexpr const char* kConnectionManagerType = "urn:schemas-upnp-org:service:ConnectionManager:1";
constexpr const char* kContentDirectoryId = "urn:upnp-org:serviceId:ContentDirectory";
constexpr const char* kConnectionManagerId = "urn:upnp-org:serviceId:ConnectionManager";
constexpr const char* kMediaDir = "/media";
constexpr const char* kScpdDir = "/upnp";
constexpr const char* kContentDirectoryScpdPath = "/upnp/ContentDirectory.xml";
constexpr const char* kConnectionManagerScpdPath = "/upnp/ConnectionManager.xml";
constexpr const char* kSourceProtocols =
    "http-get:*:audio/mpeg:*,http-get:*:audio/mp4:*,http-get:*:audio/aac:*,"
    "http-get:*:audio/ogg:*,http-get:*:audio/flac:*,http-get:*:audio/wav:*,"
    "http-get:*:audio/aiff:*,http-get:*:audio/x-ms-wma:*,http-get:*:audio/ac3:*,"
    "http-get:*:audio/x-ape:*,http-get:*:audio/x-pn-realaudio:*";

constexpr const char* kContentDirectoryScpd = R"XML(<?xml version="1.0"?>
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
</serviceStateTable>
</scpd>
)XML";

constexpr const char* kConnectionManagerScpd = R"XML(<?xml version="1.0"?>
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

// --- SOAP actions -------------------------------------------------------------------------------

// The text of the first element named `name` of the request; false when there is none.
bool ActionArgument(IXML_Document* request, const char* name, std::string* value) {
    value->clear();
    if (request == nullptr)
        return false;
    IXML_NodeList* nodes = ixmlDocument_getElementsByTagName(request, name);
    if (nodes == nullptr)
        return false;
    IXML_Node* element = ixmlNodeList_item(nodes, 0);
    IXML_Node* text = element != nullptr ? ixmlNode_getFirstChild(element) : nullptr;
    if (text != nullptr && ixmlNode_getNodeValue(text) != nullptr)
        *value = ixmlNode_getNodeValue(text);
    ixmlNodeList_free(nodes);
    return element != nullptr;
}

bool ParseUnsigned(const std::string& text, uint32_t* value) {
    std::string digits = text;
    digits.erase(0, digits.find_first_not_of(" \t\r\n"));
    digits.erase(digits.find_last_not_of(" \t\r\n") + 1);
    if (digits.empty() || digits.size() > 10 ||
        digits.find_first_not_of("0123456789") != std::string::npos)
        return false;
    const unsigned long long parsed = std::strtoull(digits.c_str(), nullptr, 10);
    if (parsed > 0xffffffffULL)
        return false;
    *value = static_cast<uint32_t>(parsed);
    return true;
}

void SetFault(UpnpActionRequest* request, int code, const char* text) {
    UpnpActionRequest_set_ErrCode(request, code);
    UpnpActionRequest_strcpy_ErrStr(request, text);
    UpnpActionRequest_set_ActionResult(request, nullptr);
}

struct OutArg {
    const char* name;
    std::string value;
};

void SetResponse(UpnpActionRequest* request, const char* action, const char* serviceType,
                 const std::vector<OutArg>& args) {
    IXML_Document* response = UpnpMakeActionResponse(action, serviceType, 0, nullptr);
    for (const OutArg& arg : args)
        UpnpAddToActionResponse(&response, action, serviceType, arg.name, arg.value.c_str());
    UpnpActionRequest_set_ErrCode(request, UPNP_E_SUCCESS);
    UpnpActionRequest_set_ActionResult(request, response);
}

void HandleBrowse(const ContentDirectory& directory, UpnpActionRequest* request) {
    IXML_Document* in = UpnpActionRequest_get_ActionRequest(request);
    BrowseArgs args;
    std::string flag, start, count;
    ActionArgument(in, "SortCriteria", &args.sortCriteria);
    if (!ActionArgument(in, "ObjectID", &args.objectId) ||
        !ActionArgument(in, "BrowseFlag", &flag) ||
        (flag != "BrowseMetadata" && flag != "BrowseDirectChildren") ||
        (ActionArgument(in, "StartingIndex", &start) &&
         !ParseUnsigned(start, &args.startingIndex)) ||
        (ActionArgument(in, "RequestedCount", &count) &&
         !ParseUnsigned(count, &args.requestedCount))) {
        SetFault(request, kErrorInvalidArgs, "Invalid Args");
        return;
    }
    args.metadata = flag == "BrowseMetadata";
    const BrowseResult result = directory.Browse(args);
    if (result.error != 0) {
        SetFault(request, result.error, result.errorText.c_str());
        return;
    }
    SetResponse(request, "Browse", kContentDirectoryType,
                {{"Result", result.didl},
                 {"NumberReturned", std::to_string(result.numberReturned)},
                 {"TotalMatches", std::to_string(result.totalMatches)},
                 {"UpdateID", std::to_string(result.updateId)}});
}

void HandleContentDirectory(const ContentDirectory& directory, UpnpActionRequest* request,
                            const std::string& action) {
    if (action == "Browse")
        HandleBrowse(directory, request);
    else if (action == "GetSearchCapabilities")
        SetResponse(request, "GetSearchCapabilities", kContentDirectoryType,
                    {{"SearchCaps", kSearchCapabilities}});
    else if (action == "GetSortCapabilities")
        SetResponse(request, "GetSortCapabilities", kContentDirectoryType,
                    {{"SortCaps", kSortCapabilities}});
    else if (action == "GetSystemUpdateID")
        SetResponse(request, "GetSystemUpdateID", kContentDirectoryType,
                    {{"Id", std::to_string(directory.SystemUpdateId())}});
    else
        SetFault(request, 401, "Invalid Action");
}

void HandleConnectionManager(UpnpActionRequest* request, const std::string& action) {
    if (action == "GetProtocolInfo") {
        SetResponse(request, "GetProtocolInfo", kConnectionManagerType,
                    {{"Source", kSourceProtocols}, {"Sink", ""}});
    } else if (action == "GetCurrentConnectionIDs") {
        SetResponse(request, "GetCurrentConnectionIDs", kConnectionManagerType,
                    {{"ConnectionIDs", "0"}});
    } else if (action == "GetCurrentConnectionInfo") {
        std::string id;
        ActionArgument(UpnpActionRequest_get_ActionRequest(request), "ConnectionID", &id);
        if (id != "0") {
            SetFault(request, 706, "Invalid connection reference");
            return;
        }
        SetResponse(request, "GetCurrentConnectionInfo", kConnectionManagerType,
                    {{"RcsID", "-1"},
                     {"AVTransportID", "-1"},
                     {"ProtocolInfo", ""},
                     {"PeerConnectionManager", ""},
                     {"PeerConnectionID", "-1"},
                     {"Direction", "Output"},
                     {"Status", "OK"}});
    } else {
        SetFault(request, 401, "Invalid Action");
    }
}

int DeviceCallback(Upnp_EventType eventType, const void* event, void* cookie) {
    return static_cast<MediaServer*>(cookie)->OnDeviceEvent(eventType, event);
}

// --- Files served by libupnp's web server -------------------------------------------------------

struct WebFile {
    int fd = -1;                   // an indexed audio file, or
    const char* memory = nullptr;  // an SCPD held in memory
    off_t size = 0;
    off_t position = 0;
};

const char* ScpdOf(const std::string& path) {
    if (path == kContentDirectoryScpdPath)
        return kContentDirectoryScpd;
    if (path == kConnectionManagerScpdPath)
        return kConnectionManagerScpd;
    return nullptr;
}

std::string WithoutQuery(const char* filename) {
    std::string path = filename != nullptr ? filename : "";
    const std::size_t query = path.find('?');
    if (query != std::string::npos)
        path.erase(query);
    return path;
}

// "/media/<track id>[.<extension>]" -> the indexed file; the request never names a path itself.
bool ResolveMediaPath(const ContentDirectory& directory, const std::string& url,
                      std::string* file) {
    const std::string prefix = std::string(kMediaDir) + "/";
    if (url.compare(0, prefix.size(), prefix) != 0)
        return false;
    std::string name = url.substr(prefix.size());
    std::string extension;
    const std::size_t dot = name.find('.');
    if (dot != std::string::npos) {
        extension = name.substr(dot + 1);
        name.erase(dot);
    }
    if (name.empty() || name.size() > 18 ||
        name.find_first_not_of("0123456789") != std::string::npos)
        return false;
    if (!directory.LookUpTrackFile(std::strtoll(name.c_str(), nullptr, 10), file))
        return false;
    return extension == medialib::LowerExtension(*file);
}

// Opens an indexed file: a regular file, never through a symbolic link at its last component.
int OpenMediaFile(const std::string& path, struct stat* st) {
    const int fd = open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
    if (fd < 0)
        return -1;
    if (fstat(fd, st) != 0 || !S_ISREG(st->st_mode)) {
        close(fd);
        return -1;
    }
    return fd;
}

int WebGetInfo(const char* filename, UpnpFileInfo* info, const void* cookie) {
    const auto* server = static_cast<const MediaServer*>(cookie);
    const std::string url = WithoutQuery(filename);
    UpnpFileInfo_set_IsDirectory(info, 0);
    UpnpFileInfo_set_IsReadable(info, 1);
    if (const char* scpd = ScpdOf(url)) {
        UpnpFileInfo_set_FileLength(info, static_cast<off_t>(std::strlen(scpd)));
        UpnpFileInfo_set_LastModified(info, 0);
        UpnpFileInfo_set_ContentType(info, const_cast<char*>("text/xml; charset=\"utf-8\""));
        return 0;
    }
    std::string path;
    if (server == nullptr || !ResolveMediaPath(*server->contentDirectory(), url, &path))
        return -1;
    struct stat st {};
    const int fd = OpenMediaFile(path, &st);
    if (fd < 0)
        return -1;
    close(fd);
    UpnpFileInfo_set_FileLength(info, st.st_size);
    UpnpFileInfo_set_LastModified(info, st.st_mtime);
    UpnpFileInfo_set_ContentType(info, const_cast<char*>(medialib::MimeTypeOfPath(path)));
    return 0;
}

UpnpWebFileHandle WebOpen(const char* filename, enum UpnpOpenFileMode mode, const void* cookie) {
    if (mode != UPNP_READ)
        return nullptr;
    const auto* server = static_cast<const MediaServer*>(cookie);
    const std::string url = WithoutQuery(filename);
    if (const char* scpd = ScpdOf(url)) {
        auto* file = new WebFile;
        file->memory = scpd;
        file->size = static_cast<off_t>(std::strlen(scpd));
        return file;
    }
    std::string path;
    if (server == nullptr || !ResolveMediaPath(*server->contentDirectory(), url, &path))
        return nullptr;
    struct stat st {};
    const int fd = OpenMediaFile(path, &st);
    if (fd < 0)
        return nullptr;
    auto* file = new WebFile;
    file->fd = fd;
    file->size = st.st_size;
    return file;
}

int WebRead(UpnpWebFileHandle handle, char* buffer, size_t length, const void*) {
    auto* file = static_cast<WebFile*>(handle);
    if (file == nullptr || file->position >= file->size)
        return 0;
    const size_t wanted =
        std::min<size_t>(length, static_cast<size_t>(file->size - file->position));
    ssize_t got = 0;
    if (file->memory != nullptr) {
        std::memcpy(buffer, file->memory + file->position, wanted);
        got = static_cast<ssize_t>(wanted);
    } else {
        do {
            got = pread(file->fd, buffer, wanted, file->position);
        } while (got < 0 && errno == EINTR);
        if (got < 0)
            return -1;
    }
    file->position += got;
    return static_cast<int>(got);
}

int WebWrite(UpnpWebFileHandle, char*, size_t, const void*) {
    return -1;  // nothing on this server is writable
}

int WebSeek(UpnpWebFileHandle handle, off_t offset, int origin, const void*) {
    auto* file = static_cast<WebFile*>(handle);
    if (file == nullptr)
        return -1;
    off_t base = 0;
    if (origin == SEEK_CUR)
        base = file->position;
    else if (origin == SEEK_END)
        base = file->size;
    else if (origin != SEEK_SET)
        return -1;
    const off_t target = base + offset;
    if (target < 0 || target > file->size)
        return -1;
    file->position = target;
    return 0;
}

int WebClose(UpnpWebFileHandle handle, const void*) {
    auto* file = static_cast<WebFile*>(handle);
    if (file == nullptr)
        return -1;
    if (file->fd >= 0)
        close(file->fd);
    delete file;
    return 0;
}

// A stable device id: from the machine id when there is one.
std::string MakeUdn() {
    std::string hex;
    const int fd = open("/etc/machine-id", O_RDONLY | O_CLOEXEC);
    if (fd >= 0) {
        char buffer[64] = {};
        const ssize_t got = read(fd, buffer, sizeof(buffer) - 1);
        close(fd);
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

std::string HostName() {
    char name[256] = {};
    if (gethostname(name, sizeof(name) - 1) != 0 || name[0] == '\0')
        return "storage";
    return name;
}

}  // namespace

std::string DeviceDescription(const std::string& udn, const std::string& friendlyName) {
    std::string xml =
        "<?xml version=\"1.0\"?>\n"
        "<root xmlns=\"urn:schemas-upnp-org:device-1-0\">"
        "<specVersion><major>1</major><minor>0</minor></specVersion>"
        "<device><deviceType>urn:schemas-upnp-org:device:MediaServer:1</deviceType>"
        "<friendlyName>" +
        XmlEscape(friendlyName) +
        "</friendlyName>"
        "<manufacturer>Harmona</manufacturer><modelDescription>Harmona music "
        "library</modelDescription>"
        "<modelName>harmona-mediad</modelName><modelNumber>1</modelNumber>"
        "<UDN>" +
        udn + "</UDN><serviceList>";
    xml += std::string("<service><serviceType>") + kContentDirectoryType +
           "</serviceType><serviceId>" + kContentDirectoryId + "</serviceId><SCPDURL>" +
           kContentDirectoryScpdPath +
           "</SCPDURL><controlURL>/ContentDirectory/control</controlURL>"
           "<eventSubURL>/ContentDirectory/event</eventSubURL></service>";
    xml += std::string("<service><serviceType>") + kConnectionManagerType +
           "</serviceType><serviceId>" + kConnectionManagerId + "</serviceId><SCPDURL>" +
           kConnectionManagerScpdPath +
           "</SCPDURL><controlURL>/ConnectionManager/control</controlURL>"
           "<eventSubURL>/ConnectionManager/event</eventSubURL></service>";
    xml += "</serviceList></device></root>\n";
    return xml;
}

int MediaServer::OnDeviceEvent(int eventType, const void* event) {
    if (eventType == UPNP_CONTROL_ACTION_REQUEST) {
        auto* request = static_cast<UpnpActionRequest*>(const_cast<void*>(event));
        const std::string service = UpnpActionRequest_get_ServiceID_cstr(request);
        const std::string action = UpnpActionRequest_get_ActionName_cstr(request);
        if (service == kContentDirectoryId)
            HandleContentDirectory(*contentDirectory_, request, action);
        else if (service == kConnectionManagerId)
            HandleConnectionManager(request, action);
        else
            SetFault(request, 401, "Invalid Action");
    } else if (eventType == UPNP_EVENT_SUBSCRIPTION_REQUEST) {
        const auto* request = static_cast<const UpnpSubscriptionRequest*>(event);
        const std::string service = UpnpSubscriptionRequest_get_ServiceId_cstr(request);
        std::vector<std::string> names, values;
        if (service == kContentDirectoryId) {
            names = {"SystemUpdateID"};
            values = {std::to_string(contentDirectory_->SystemUpdateId())};
        } else {
            names = {"SourceProtocolInfo", "SinkProtocolInfo", "CurrentConnectionIDs"};
            values = {kSourceProtocols, "", "0"};
        }
        std::vector<const char*> namePointers, valuePointers;
        for (std::size_t i = 0; i < names.size(); ++i) {
            namePointers.push_back(names[i].c_str());
            valuePointers.push_back(values[i].c_str());
        }
        UpnpAcceptSubscription(device_.handle(), UpnpSubscriptionRequest_get_UDN_cstr(request),
                               service.c_str(), namePointers.data(), valuePointers.data(),
                               static_cast<int>(names.size()),
                               UpnpSubscriptionRequest_get_SID_cstr(request));
    }
    return 0;
}

bool MediaServer::Start(const MediaServerOptions& options, std::string* error) {
    Stop();
    library_ = std::make_unique<upnp::UpnpLibrary>(options.interfaceName, options.port);
    if (!library_->ok()) {
        *error = "libupnp did not start: " + library_->ErrorText();
        library_.reset();
        return false;
    }
    if (library_->ServerPort() != options.port) {
        *error = "port " + std::to_string(options.port) + " is taken (libupnp got " +
                 std::to_string(library_->ServerPort()) + ")";
        library_.reset();
        return false;
    }
    if (library_->ServerAddress() != "127.0.0.1" &&
        !loopbackRelay_.Start(options.port, library_->ServerAddress(), error)) {
        Stop();
        return false;
    }
    const std::string base =
        "http://" + library_->ServerAddress() + ":" + std::to_string(library_->ServerPort());
    contentDirectory_ = std::make_unique<ContentDirectory>(options.dbPath, options.sharePath,
                                                           base + kMediaDir + "/");
    const bool webOk = UpnpEnableWebserver(1) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_GetInfoCallback(WebGetInfo) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_OpenCallback(WebOpen) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_ReadCallback(WebRead) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_WriteCallback(WebWrite) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_SeekCallback(WebSeek) == UPNP_E_SUCCESS &&
                       UpnpVirtualDir_set_CloseCallback(WebClose) == UPNP_E_SUCCESS &&
                       UpnpAddVirtualDir(kMediaDir, this, nullptr) == UPNP_E_SUCCESS &&
                       UpnpAddVirtualDir(kScpdDir, this, nullptr) == UPNP_E_SUCCESS;
    if (!webOk) {
        *error = "libupnp's web server cannot be set up";
        Stop();
        return false;
    }
    udn_ = MakeUdn();
    const int registered =
        device_.Register(DeviceDescription(udn_, "Harmona Music Library (" + HostName() + ")"),
                         DeviceCallback, this);
    if (registered != UPNP_E_SUCCESS) {
        *error = std::string("device registration failed: ") + UpnpGetErrorMessage(registered);
        Stop();
        return false;
    }
    const int advertised = device_.Advertise(kAdvertisementSeconds);
    if (advertised != UPNP_E_SUCCESS) {
        // The device still answers on its address; the announcement is retried by libupnp.
        syslog(LOG_WARNING, "SSDP announcement failed: %s", UpnpGetErrorMessage(advertised));
    }
    return true;
}

void MediaServer::Stop() {
    loopbackRelay_.Stop();
    device_.Unregister();
    library_.reset();  // UpnpFinish: no callback runs after this
    contentDirectory_.reset();
}

}  // namespace harmona::mediad
