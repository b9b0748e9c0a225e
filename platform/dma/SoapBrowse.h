// The pieces of a ContentDirectory:1 Browse that need no network: the SOAP 1.1 request envelope,
// its XML escaping, and the parsing of the SOAP reply and of its DIDL-Lite result. XML from the
// network is hostile: pugixml expands no DTD and no entity beyond the five predefined ones and
// character references, and fetches nothing.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

class ItemNode;

namespace harmona::dma {

inline constexpr const char* kSoapEnvelopeNs = "http://schemas.xmlsoap.org/soap/envelope/";
inline constexpr const char* kContentDirectoryNs =
    "urn:schemas-upnp-org:service:ContentDirectory:1";
inline constexpr const char* kDidlNs = "urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/";
inline constexpr const char* kDublinCoreNs = "http://purl.org/dc/elements/1.1/";
inline constexpr const char* kUpnpNs = "urn:schemas-upnp-org:metadata-1-0/upnp/";
inline constexpr const char* kBrowseSoapAction =
    "SOAPACTION: \"urn:schemas-upnp-org:service:ContentDirectory:1#Browse\"";
inline constexpr const char* kBrowseContentType = "Content-Type: text/xml; charset=\"utf-8\"";

// A dead or hostile media server costs a request at most these.
inline constexpr long kConnectTimeoutMs = 2000;
inline constexpr long kWholeReplyTimeoutMs = 20000;
inline constexpr std::size_t kMaxReplyBytes = 64u * 1024u * 1024u;

// What one request's memory bound (RequestMemory.h) leaves for a browse. The reply's text is
// bounded above; the parsed document of a page and the objects of all pages are bounded here:
// - the parsed DIDL-Lite tree of one page: pugixml takes kDidlBytesPerNode per node (an element,
//   or a run of text) and kDidlBytesPerAttribute per attribute, estimated from the text before it
//   is parsed: every `<` that is not a closing tag may open an element, every `<` after something
//   other than `>` may end a run of text, and every `=` may be an attribute, so the estimate is
//   never below the truth;
// - the objects of the whole browse, each kept as an ItemNode and then written as a tree node: at
//   most kMaxBrowseObjects of them, with at most kMaxBrowseTextBytes of values in all (a browse of
//   many pages is not bounded by the reply limit, which holds per page).
inline constexpr std::size_t kDidlBytesPerNode = 64;
inline constexpr std::size_t kDidlBytesPerAttribute = 40;
inline constexpr std::size_t kMaxDidlTreeBytes = std::size_t{192} << 20;
inline constexpr std::size_t kMaxBrowseObjects = 200000;
inline constexpr std::size_t kMaxBrowseTextBytes = std::size_t{48} << 20;

// The memory that parsing `didl` would take at most, by the estimate above.
std::size_t EstimatedDidlTreeBytes(const char* didl, std::size_t size);

// True for "http://host[:port][/path]" with a non-empty host (scheme case-insensitive).
bool IsAbsoluteHttpUrl(const std::string& url);

// True for an absolute http URL (as above) whose host is a numeric IPv4 or IPv6 address of another
// machine: not a name (which a lookup could point anywhere), not loopback (127.0.0.0/8, ::1), not
// link-local (169.254.0.0/16, fe80::/10) and not unspecified (0.0.0.0, ::). Media servers on the
// network are browsed only at such a URL, so that a device's description cannot steer a request
// to a service on this machine.
bool IsNetworkHostUrl(const std::string& url);

// The host of an absolute http URL (IsAbsoluteHttpUrl): what stands between "://" and the port
// or path, without the brackets of an IPv6 address.
std::string HttpUrlHost(const std::string& url);

// The SOAP 1.1 body of a Browse action; every argument escaped.
std::string BuildBrowseEnvelope(const std::string& objectId, const char* browseFlag,
                                const std::string& filter, unsigned long startingIndex,
                                unsigned long requestedCount, const std::string& sortCriteria);

struct BrowsePage {
    bool hasResult = false;  // a non-empty Result element
    unsigned long totalMatches = 0;
    unsigned long numberReturned = 0;

    // The DIDL-Lite text of Result, unescaped. When Result holds one piece of text (the usual
    // case) it is left where the parse put it, inside the reply buffer, which must then outlive
    // its use: a megabyte-sized result is not copied. Pieces of text and CDATA are joined.
    char* ResultData() { return inReply != nullptr ? inReply : joined.data(); }
    std::size_t ResultSize() const { return inReply != nullptr ? inReplySize : joined.size(); }
    std::string ResultText() { return std::string(ResultData(), ResultSize()); }

    char* inReply = nullptr;
    std::size_t inReplySize = 0;
    std::string joined;
};

enum class ReplyStatus { ok, malformed, fault, notBrowseResponse };

// Parses a SOAP reply (modified in place: pugixml parses the buffer itself; `page` may point into
// it).
ReplyStatus ParseBrowseResponse(std::string& reply, BrowsePage& page);

// Appends the DIDL-Lite document's container and item objects, in document order, to `items` (new
// objects, owned by the caller); the number appended, -1 when the document is not DIDL-Lite XML, or
// kTooManyObjects when `items` would grow past `maxItems` (what was appended stays, for the caller
// to free).
inline constexpr long kTooManyObjects = -2;
long ParseDidl(char* didl, std::size_t size, std::vector<ItemNode*>& items,
               std::size_t maxItems = static_cast<std::size_t>(-1));
inline long ParseDidl(std::string& didl, std::vector<ItemNode*>& items) {
    return ParseDidl(didl.data(), didl.size(), items);
}

}  // namespace harmona::dma
