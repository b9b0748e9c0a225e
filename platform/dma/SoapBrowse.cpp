#include "platform/dma/SoapBrowse.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <array>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <pugixml.hpp>
#include <string_view>

#include "common/util/XmlEscape.h"
#include "platform/dma/ItemNode.h"

namespace harmona::dma {

bool IsAbsoluteHttpUrl(const std::string& url) {
    static constexpr char kScheme[] = "http://";
    const std::size_t schemeLength = sizeof(kScheme) - 1;
    if (url.size() <= schemeLength || strncasecmp(url.c_str(), kScheme, schemeLength) != 0)
        return false;
    const std::size_t hostEnd = url.find_first_of("/?#", schemeLength);
    const std::string authority = url.substr(schemeLength, hostEnd - schemeLength);
    if (authority.empty() || authority[0] == ':' || authority.find('@') != std::string::npos)
        return false;
    for (const char c : url)
        if (static_cast<unsigned char>(c) <= 0x20 || c == 0x7f)
            return false;
    return true;
}

namespace {

// The host of an absolute http URL, without the brackets of an IPv6 literal; "" when malformed.
std::string HostOf(const std::string& url) {
    const std::size_t start = url.find("://") + 3;
    const std::size_t end = url.find_first_of("/?#", start);
    const std::string authority = url.substr(start, end == std::string::npos ? end : end - start);
    if (!authority.empty() && authority[0] == '[') {
        const std::size_t close = authority.find(']');
        return close == std::string::npos ? std::string() : authority.substr(1, close - 1);
    }
    return authority.substr(0, authority.find(':'));
}

bool IsNetworkIpv4(const in_addr& address) {
    const uint32_t host = ntohl(address.s_addr);
    const bool loopback = (host >> 24) == 127;
    const bool linkLocal = (host >> 16) == 0xa9fe;  // 169.254.0.0/16
    return host != 0 && !loopback && !linkLocal;
}

bool IsNetworkIpv6(const in6_addr& address) {
    if (IN6_IS_ADDR_V4MAPPED(&address)) {
        in_addr v4{};
        std::memcpy(&v4, address.s6_addr + 12, sizeof(v4));
        return IsNetworkIpv4(v4);
    }
    return !IN6_IS_ADDR_UNSPECIFIED(&address) && !IN6_IS_ADDR_LOOPBACK(&address) &&
           !IN6_IS_ADDR_LINKLOCAL(&address);
}

}  // namespace

bool IsNetworkHostUrl(const std::string& url) {
    if (!IsAbsoluteHttpUrl(url))
        return false;
    const std::string host = HostOf(url);
    in_addr v4{};
    in6_addr v6{};
    // inet_pton takes only the dotted quad for IPv4: no "127.1", octal or hexadecimal forms.
    if (inet_pton(AF_INET, host.c_str(), &v4) == 1)
        return IsNetworkIpv4(v4);
    if (inet_pton(AF_INET6, host.c_str(), &v6) == 1)
        return IsNetworkIpv6(v6);
    return false;
}

std::string HttpUrlHost(const std::string& url) {
    return IsAbsoluteHttpUrl(url) ? HostOf(url) : std::string();
}

std::string BuildBrowseEnvelope(const std::string& objectId, const char* browseFlag,
                                const std::string& filter, unsigned long startingIndex,
                                unsigned long requestedCount, const std::string& sortCriteria) {
    std::string body;
    body.reserve(512 + objectId.size() * 2);
    body += "<?xml version=\"1.0\" encoding=\"utf-8\"?>\r\n";
    body += "<s:Envelope xmlns:s=\"";
    body += kSoapEnvelopeNs;
    body += "\" s:encodingStyle=\"http://schemas.xmlsoap.org/soap/encoding/\"><s:Body>";
    body += "<u:Browse xmlns:u=\"";
    body += kContentDirectoryNs;
    body += "\"><ObjectID>" + util::XmlText(objectId) + "</ObjectID>";
    body += "<BrowseFlag>" + util::XmlText(browseFlag) + "</BrowseFlag>";
    body += "<Filter>" + util::XmlText(filter) + "</Filter>";
    body += "<StartingIndex>" + std::to_string(startingIndex) + "</StartingIndex>";
    body += "<RequestedCount>" + std::to_string(requestedCount) + "</RequestedCount>";
    body += "<SortCriteria>" + util::XmlText(sortCriteria) + "</SortCriteria>";
    body += "</u:Browse></s:Body></s:Envelope>\r\n";
    return body;
}

namespace {

// pugixml knows no namespaces: these resolve an element's prefix through the xmlns declarations of
// the element and its ancestors, so that any prefix (or a default namespace) matches by URI.
const char* LocalName(const char* qualified) {
    const char* colon = std::strchr(qualified, ':');
    return colon != nullptr ? colon + 1 : qualified;
}

const char* NamespaceOf(pugi::xml_node element) {
    const char* name = element.name();
    const char* colon = std::strchr(name, ':');
    std::string attribute = "xmlns";
    if (colon != nullptr)
        attribute += ":" + std::string(name, colon);
    for (pugi::xml_node n = element; n.type() == pugi::node_element; n = n.parent()) {
        const pugi::xml_attribute declaration = n.attribute(attribute.c_str());
        if (declaration)
            return declaration.value();
    }
    return "";
}

bool Is(pugi::xml_node element, const char* ns, const char* local) {
    return element.type() == pugi::node_element &&
           std::strcmp(LocalName(element.name()), local) == 0 &&
           std::strcmp(NamespaceOf(element), ns) == 0;
}

pugi::xml_node FindChild(pugi::xml_node parent, const char* ns, const char* local) {
    for (pugi::xml_node child : parent.children())
        if (Is(child, ns, local))
            return child;
    return {};
}

// A child element by local name only: the arguments of a SOAP action reply are unqualified, but
// some servers qualify them; either is accepted.
pugi::xml_node FindArgument(pugi::xml_node parent, const char* local) {
    for (pugi::xml_node child : parent.children())
        if (child.type() == pugi::node_element && std::strcmp(LocalName(child.name()), local) == 0)
            return child;
    return {};
}

// XML's white space, trimmed from values that are not free text.
constexpr const char* kXmlSpace = " \t\r\n";

// All character data directly inside `element` (text and CDATA pieces joined) into `out`, whose
// buffer is reused.
void AssignTextOf(pugi::xml_node element, std::string& out) {
    out.clear();
    for (pugi::xml_node child : element.children())
        if (child.type() == pugi::node_pcdata || child.type() == pugi::node_cdata)
            out += child.value();
}

std::string TextOf(pugi::xml_node element) {
    std::string text;
    AssignTextOf(element, text);
    return text;
}

unsigned long ToUnsigned(const std::string& text) {
    const char* begin = text.c_str() + std::strspn(text.c_str(), kXmlSpace);
    if (*begin < '0' || *begin > '9')
        return 0;
    return std::strtoul(begin, nullptr, 10);
}

constexpr unsigned kParseOptions = pugi::parse_default;  // no parse_doctype: a DTD is skipped

bool ParseInPlace(pugi::xml_document& document, char* text, std::size_t size) {
    const pugi::xml_parse_result parsed =
        document.load_buffer_inplace(text, size, kParseOptions, pugi::encoding_auto);
    return static_cast<bool>(parsed);
}

bool IsBlank(const char* text, std::size_t size) {
    return std::string_view(text, size).find_first_not_of(kXmlSpace) == std::string_view::npos;
}

// Points `page` at the text of Result: in place when it is one piece of character data (pugixml
// parsed the reply in place, so that piece is the unescaped text, NUL-terminated, inside the reply
// buffer), joined into `page.joined` otherwise.
void TakeResult(pugi::xml_node result, BrowsePage& page) {
    pugi::xml_node only;
    int pieces = 0;
    for (pugi::xml_node child : result.children()) {
        if (child.type() == pugi::node_pcdata || child.type() == pugi::node_cdata) {
            only = child;
            ++pieces;
        }
    }
    if (pieces == 1) {
        page.inReply = const_cast<char*>(only.value());
        page.inReplySize = std::strlen(page.inReply);
    } else {
        page.joined = TextOf(result);
    }
    page.hasResult = !IsBlank(page.ResultData(), page.ResultSize());
}

const char* ContentDirectoryPrefix = "urn:schemas-upnp-org:service:ContentDirectory:";

}  // namespace

ReplyStatus ParseBrowseResponse(std::string& reply, BrowsePage& page) {
    page = BrowsePage{};
    pugi::xml_document document;
    if (!ParseInPlace(document, reply.data(), reply.size()))
        return ReplyStatus::malformed;
    const pugi::xml_node envelope = document.document_element();
    if (!Is(envelope, kSoapEnvelopeNs, "Envelope"))
        return ReplyStatus::malformed;
    const pugi::xml_node body = FindChild(envelope, kSoapEnvelopeNs, "Body");
    if (!body)
        return ReplyStatus::malformed;
    if (FindChild(body, kSoapEnvelopeNs, "Fault"))
        return ReplyStatus::fault;
    pugi::xml_node response;
    for (pugi::xml_node child : body.children()) {
        if (child.type() == pugi::node_element &&
            std::strcmp(LocalName(child.name()), "BrowseResponse") == 0 &&
            std::strncmp(NamespaceOf(child), ContentDirectoryPrefix,
                         std::strlen(ContentDirectoryPrefix)) == 0) {
            response = child;
            break;
        }
    }
    if (!response)
        return ReplyStatus::notBrowseResponse;
    const pugi::xml_node result = FindArgument(response, "Result");
    if (result)
        TakeResult(result, page);
    page.totalMatches = ToUnsigned(TextOf(FindArgument(response, "TotalMatches")));
    page.numberReturned = ToUnsigned(TextOf(FindArgument(response, "NumberReturned")));
    return ReplyStatus::ok;
}

namespace {

// The values of one object as they are gathered. One scratch serves every object of a document,
// so that its buffers are reused and each object costs one allocation (ItemNode::Assign).
struct ItemScratch {
    std::array<std::string, ItemNode::kFieldCount> values;
    std::string creator;
};

void Trim(std::string& text) {
    const std::size_t last = text.find_last_not_of(kXmlSpace);
    text.erase(last == std::string::npos ? 0 : last + 1);
    text.erase(0, text.find_first_not_of(kXmlSpace));
}

void FillItem(pugi::xml_node object, ItemNode& item, ItemScratch& scratch) {
    auto& values = scratch.values;
    for (std::string& value : values)
        value.clear();
    scratch.creator.clear();
    item.isContainer = std::strcmp(LocalName(object.name()), "container") == 0;
    values[ItemNode::Id] = object.attribute("id").value();
    values[ItemNode::ParentId] = object.attribute("parentID").value();
    values[ItemNode::ChildCount] = object.attribute("childCount").value();
    bool haveRes = false, haveArtist = false;
    for (pugi::xml_node child : object.children()) {
        if (child.type() != pugi::node_element)
            continue;
        const char* local = LocalName(child.name());
        const char* ns = NamespaceOf(child);
        if (std::strcmp(ns, kDublinCoreNs) == 0) {
            if (std::strcmp(local, "title") == 0)
                AssignTextOf(child, values[ItemNode::Title]);
            else if (std::strcmp(local, "creator") == 0)
                AssignTextOf(child, scratch.creator);
        } else if (std::strcmp(ns, kUpnpNs) == 0) {
            if (std::strcmp(local, "class") == 0) {
                AssignTextOf(child, values[ItemNode::Class]);
                Trim(values[ItemNode::Class]);
            } else if (std::strcmp(local, "artist") == 0 && !haveArtist) {
                AssignTextOf(child, values[ItemNode::Artist]);
                haveArtist = true;
            } else if (std::strcmp(local, "album") == 0) {
                AssignTextOf(child, values[ItemNode::Album]);
            }
        } else if (std::strcmp(ns, kDidlNs) == 0 && std::strcmp(local, "res") == 0 && !haveRes) {
            AssignTextOf(child, values[ItemNode::Res]);
            Trim(values[ItemNode::Res]);
            values[ItemNode::Duration] = child.attribute("duration").value();
            Trim(values[ItemNode::Duration]);
            haveRes = true;
        }
    }
    if (!haveArtist)
        values[ItemNode::Artist] = scratch.creator;
    std::array<std::string_view, ItemNode::kFieldCount> views;
    for (std::size_t i = 0; i < views.size(); ++i)
        views[i] = values[i];
    item.Assign(views);
}

}  // namespace

std::size_t EstimatedDidlTreeBytes(const char* didl, std::size_t size) {
    std::size_t nodes = 0;
    std::size_t attributes = 0;
    char before = '>';
    for (std::size_t i = 0; i < size; ++i) {
        const char c = didl[i];
        if (c == '<') {
            const bool closing = i + 1 < size && didl[i + 1] == '/';
            nodes += (closing ? 0 : 1) + (before != '>' ? 1 : 0);
        } else if (c == '=') {
            ++attributes;
        }
        before = c;
    }
    return nodes * kDidlBytesPerNode + attributes * kDidlBytesPerAttribute;
}

long ParseDidl(char* didl, std::size_t size, std::vector<ItemNode*>& items, std::size_t maxItems) {
    pugi::xml_document document;
    if (!ParseInPlace(document, didl, size))
        return -1;
    const pugi::xml_node root = document.document_element();
    if (!Is(root, kDidlNs, "DIDL-Lite"))
        return -1;
    long count = 0;
    ItemScratch scratch;
    for (pugi::xml_node object : root.children()) {
        if (!Is(object, kDidlNs, "container") && !Is(object, kDidlNs, "item"))
            continue;
        if (items.size() >= maxItems)
            return kTooManyObjects;
        auto* item = new ItemNode;
        FillItem(object, *item, scratch);
        items.push_back(item);
        ++count;
    }
    return count;
}

}  // namespace harmona::dma
