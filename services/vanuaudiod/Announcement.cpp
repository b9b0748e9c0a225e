#include "services/vanuaudiod/Announcement.h"

#include <gio/gio.h>

#include <cstdlib>
#include <cstring>

#include "platform/lib/gupnp/Object.h"
#include "services/vanuaudiod/Protocol.h"
#include "services/vanuaudiod/Url.h"

namespace harmona::vanuaudiod {
namespace {

constexpr const char kMediaServerPrefix[] = "urn:schemas-upnp-org:device:MediaServer:";

using AddressRef = harmona::gupnp::ObjectRef<GInetAddress>;

bool Printable(const std::string& text, std::size_t maxBytes) {
    if (text.empty() || text.size() > maxBytes)
        return false;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte <= 0x20 || byte >= 0x7F || c == '"' || c == '\\')
            return false;
    }
    return true;
}

// "max-age=1800" anywhere in the header (other directives may come first); 0 when absent.
int MaxAge(const char* cacheControl) {
    if (cacheControl == nullptr)
        return 0;
    const char* found = strcasestr(cacheControl, "max-age");
    if (found == nullptr)
        return 0;
    found += std::strlen("max-age");
    while (*found == ' ' || *found == '=')
        ++found;
    char* end = nullptr;
    const long seconds = std::strtol(found, &end, 10);
    if (end == found || seconds <= 0 || seconds > 86400 * 365)
        return 0;
    return static_cast<int>(seconds);
}

AddressRef Address(const std::string& text) {
    // A zone (fe80::1%eth0) is no part of the address proper.
    return AddressRef::Adopt(
        g_inet_address_new_from_string(text.substr(0, text.find('%')).c_str()));
}

bool IsLimitedBroadcast(GInetAddress* address) {
    if (g_inet_address_get_family(address) != G_SOCKET_FAMILY_IPV4)
        return false;
    const guint8* bytes = g_inet_address_to_bytes(address);
    return bytes[0] == 255 && bytes[1] == 255 && bytes[2] == 255 && bytes[3] == 255;
}

}  // namespace

Announcement ReadAnnouncement(const char* typeHeader, const char* nts, const char* usn,
                              const char* location, const char* cacheControl) {
    Announcement out;
    if (typeHeader == nullptr || usn == nullptr ||
        std::strncmp(typeHeader, kMediaServerPrefix, sizeof(kMediaServerPrefix) - 1) != 0)
        return out;
    std::string udn = usn;
    udn = udn.substr(0, udn.find("::"));
    if (udn.compare(0, 5, "uuid:") != 0 || !Printable(udn, kMaxUdnBytes))
        return out;
    out.udn = udn;
    if (nts != nullptr && std::strcmp(nts, "ssdp:byebye") == 0) {
        out.kind = AnnouncementKind::byebye;
        return out;
    }
    if (nts != nullptr && std::strcmp(nts, "ssdp:alive") != 0)
        return out;  // ssdp:update and the like: nothing to do
    if (location == nullptr || !Printable(location, kMaxControlUrlBytes))
        return out;
    out.kind = AnnouncementKind::alive;
    out.location = location;
    out.maxAgeSeconds = MaxAge(cacheControl);
    return out;
}

std::string RefuseLocation(const std::string& location, const AnnouncerFacts& facts) {
    UrlParts parts;
    if (!SplitHttpUrl(location, parts))
        return "location is not an http URL";
    const AddressRef host = Address(parts.host);
    if (!host)
        return "location host is not a numeric address";
    const AddressRef source = Address(facts.sourceAddress);
    if (!source || !g_inet_address_equal(host.get(), source.get()))
        return "location host " + parts.host + " is not the announcing address " +
               facts.sourceAddress;
    if (g_inet_address_get_is_loopback(host.get()))
        return "location is a loopback address";
    if (g_inet_address_get_is_any(host.get()))
        return "location is the unspecified address";
    if (g_inet_address_get_is_multicast(host.get()))
        return "location is a multicast address";
    if (IsLimitedBroadcast(host.get()) ||
        (!facts.interfaceBroadcast.empty() && parts.host == facts.interfaceBroadcast))
        return "location is a broadcast address";
    if (g_inet_address_get_is_link_local(host.get()) && !facts.linkLocalAllowed)
        return "location is link-local on an interface with routable addresses";
    return "";
}

}  // namespace harmona::vanuaudiod
