#include "services/vanuaudiod/Description.h"

#include <glib.h>
#include <pugixml.hpp>

#include <cstring>

#include "common/util/CleanText.h"
#include "platform/lib/gupnp/Object.h"
#include "services/vanuaudiod/Protocol.h"
#include "services/vanuaudiod/Url.h"

namespace harmona::vanuaudiod {
namespace {

constexpr const char kMediaServerType[] = "urn:schemas-upnp-org:device:MediaServer:";
constexpr const char kContentDirectoryType[] = "urn:schemas-upnp-org:service:ContentDirectory:";

bool StartsWith(const std::string& text, const char* prefix) {
    return text.compare(0, std::strlen(prefix), prefix) == 0;
}

// Element text with surrounding white space removed (descriptions are often pretty-printed).
std::string Text(const pugi::xml_node& node, const char* child) {
    std::string value = node.child(child).text().get();
    const std::size_t first = value.find_first_not_of(" \t\r\n");
    if (first == std::string::npos)
        return "";
    const std::size_t last = value.find_last_not_of(" \t\r\n");
    return value.substr(first, last - first + 1);
}

// Depth-first over the device and its deviceList: the first MediaServer, preferring `udn`.
void FindMediaServer(const pugi::xml_node& device, const std::string& udn, pugi::xml_node& first,
                     pugi::xml_node& exact, int depth) {
    if (!device || depth > 8 || exact)
        return;
    if (StartsWith(Text(device, "deviceType"), kMediaServerType)) {
        if (!first)
            first = device;
        if (!udn.empty() && Text(device, "UDN") == udn)
            exact = device;
    }
    for (pugi::xml_node child : device.child("deviceList").children("device"))
        FindMediaServer(child, udn, first, exact, depth + 1);
}

// No spaces, controls, quotes or backslashes: the URL is passed on as it stands.
bool PlainUrlText(const std::string& url) {
    for (const char c : url) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte <= 0x20 || byte >= 0x7F || c == '"' || c == '\\')
            return false;
    }
    return true;
}

bool UsableUrl(const std::string& url) {
    if (url.empty() || url.size() > kMaxControlUrlBytes || !PlainUrlText(url))
        return false;
    UrlParts parts;
    return SplitHttpUrl(url, parts);
}

}  // namespace

std::string ResolveUrl(const std::string& base, const std::string& relative) {
    // Checked before resolution too, which would percent-encode what the device sent.
    if (relative.empty() || relative.size() > kMaxControlUrlBytes || !PlainUrlText(relative))
        return "";
    // RFC 3986 resolution by GLib; a base that is no absolute URI gives nothing.
    const harmona::gupnp::Chars absolute(
        g_uri_resolve_relative(base.c_str(), relative.c_str(), G_URI_FLAGS_NONE, nullptr));
    if (!absolute)
        return "";
    const std::string resolved = absolute.get();
    return UsableUrl(resolved) ? resolved : "";
}

std::string HostOfUrl(const std::string& url) {
    UrlParts parts;
    if (!SplitHttpUrl(url, parts))
        return "";
    return parts.host;
}

bool ParseDeviceDescription(const std::string& xml, const std::string& location,
                            const std::string& udn, MediaServer& out) {
    pugi::xml_document document;
    // No entity expansion beyond the predefined ones, no DOCTYPE processing: pugixml never loads
    // external entities.
    const pugi::xml_parse_result parsed =
        document.load_buffer(xml.data(), xml.size(), pugi::parse_default & ~pugi::parse_doctype);
    if (!parsed)
        return false;
    const pugi::xml_node root = document.child("root");
    pugi::xml_node first;
    pugi::xml_node exact;
    FindMediaServer(root.child("device"), udn, first, exact, 0);
    const pugi::xml_node device = exact ? exact : first;
    if (!device)
        return false;
    const std::string urlBase = Text(root, "URLBase");
    const std::string base = urlBase.empty() ? location : urlBase;
    std::string controlUrl;
    for (pugi::xml_node service : device.child("serviceList").children("service")) {
        if (StartsWith(Text(service, "serviceType"), kContentDirectoryType)) {
            controlUrl = ResolveUrl(base, Text(service, "controlURL"));
            break;
        }
    }
    if (controlUrl.empty())
        return false;
    const std::string ip = HostOfUrl(location);
    if (ip.empty() || ip.size() > kMaxIpBytes)
        return false;
    // The location was checked against the announcer; the control URL must be on that same host
    // (any port), or a LAN device could have the CGI post to loopback or to a third host.
    if (g_ascii_strcasecmp(HostOfUrl(controlUrl).c_str(), ip.c_str()) != 0)
        return false;
    // Listed as JSON text: bytes that are not UTF-8, control bytes and DEL become spaces.
    out.friendlyName =
        util::CleanText(Text(device, "friendlyName"), util::kPrintableUtf8, kMaxFriendlyNameBytes);
    out.controlUrl = controlUrl;
    out.ip = util::CleanText(ip, util::kPrintableUtf8, kMaxIpBytes);
    return true;
}

}  // namespace harmona::vanuaudiod
