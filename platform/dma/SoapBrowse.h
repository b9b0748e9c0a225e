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

// Escapes & < > " ' and CR, LF, TAB (as character references, so that they survive the
// receiver's line-end and attribute normalisation). Other bytes, UTF-8 included, stay as they are.
std::string XmlEscape(const std::string& text);

// True for "http://host[:port][/path]" with a non-empty host (scheme case-insensitive).
bool IsAbsoluteHttpUrl(const std::string& url);

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

enum class ReplyStatus { Ok, Malformed, Fault, NotBrowseResponse };

// Parses a SOAP reply (modified in place: pugixml parses the buffer itself; `page` may point into
// it).
ReplyStatus ParseBrowseResponse(std::string& reply, BrowsePage& page);

// Appends the DIDL-Lite document's container and item objects, in document order, to `items` (new
// objects, owned by the caller); the number appended, or -1 when the document is not DIDL-Lite XML.
long ParseDidl(char* didl, std::size_t size, std::vector<ItemNode*>& items);
inline long ParseDidl(std::string& didl, std::vector<ItemNode*>& items) {
    return ParseDidl(didl.data(), didl.size(), items);
}

}  // namespace harmona::dma
