#include "services/vanuaudiod/Protocol.h"

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

namespace harmona::vanuaudiod {
namespace {

// Parses [-]digits from text[pos]; advances pos. Refuses empty digit runs and int overflow.
bool ParseInt(const std::string& text, std::size_t& pos, int& value) {
    bool negative = false;
    if (pos < text.size() && text[pos] == '-') {
        negative = true;
        ++pos;
    }
    const std::size_t start = pos;
    long long magnitude = 0;
    while (pos < text.size() && text[pos] >= '0' && text[pos] <= '9') {
        magnitude = magnitude * 10 + (text[pos] - '0');
        if (magnitude > static_cast<long long>(INT_MAX) + 1)
            return false;
        ++pos;
    }
    if (pos == start)
        return false;
    const long long signedValue = negative ? -magnitude : magnitude;
    if (signedValue > INT_MAX || signedValue < INT_MIN)
        return false;
    value = static_cast<int>(signedValue);
    return true;
}

std::string ElementJson(const MediaServer& server) {
    std::string element = "{\"control_url\": ";
    element += JsonString(server.controlUrl);
    element += ", \"friendly_name\": ";
    element += JsonString(server.friendlyName);
    element += ", \"ip\": ";
    element += JsonString(server.ip);
    element += ", \"udn\": ";
    element += JsonString(server.udn);
    element += "}";
    return element;
}

}  // namespace

bool ParseRequest(const unsigned char* record, std::size_t size, Request& out) {
    if (record == nullptr || size != kRequestSize)
        return false;
    std::memcpy(&out.command, record, kCommandSize);
    const char* arguments = reinterpret_cast<const char*>(record + kCommandSize);
    const void* terminator = std::memchr(arguments, '\0', kArgumentSize);
    if (terminator == nullptr)
        return false;
    out.arguments.assign(arguments, static_cast<const char*>(terminator) - arguments);
    return true;
}

bool ParsePageArguments(const std::string& text, int& offset, int& count) {
    std::size_t pos = 0;
    int first = 0;
    int second = 0;
    if (!ParseInt(text, pos, first))
        return false;
    if (pos >= text.size() || text[pos] != ' ')
        return false;
    ++pos;
    if (!ParseInt(text, pos, second) || pos != text.size())
        return false;
    if (first < 0 || second < 0)
        return false;
    offset = first;
    count = second;
    return true;
}

std::string SuccessReply() {
    return "{\"success\": true}";
}

std::string ErrorReply(const char* error) {
    return std::string("{\"success\": false, \"error\": ") + JsonString(error) + "}";
}

std::string UnsupportedReply() {
    return ErrorReply("unsupported");
}

std::string ListReply(const std::vector<MediaServer>& servers, int offset, int count,
                      std::size_t maxBytes) {
    const std::string total = std::to_string(servers.size());
    const std::string head = "{\"success\": true, \"list\": [";
    const std::string tail = "], \"total\": " + total + "}";
    std::string reply = head;
    const std::size_t first = static_cast<std::size_t>(offset);
    const std::size_t end = first >= servers.size()
                                ? first
                                : first + std::min<std::size_t>(count, servers.size() - first);
    bool any = false;
    for (std::size_t i = first; i < end; ++i) {
        const std::string element = ElementJson(servers[i]);
        const std::size_t separator = any ? 2 : 0;
        if (reply.size() + separator + element.size() + tail.size() > maxBytes)
            break;  // the page is cut here; "total" tells the client there is more
        if (any)
            reply += ", ";
        reply += element;
        any = true;
    }
    reply += tail;
    return reply;
}

std::string Answer(const Request& request, const std::vector<MediaServer>& servers,
                   bool& startSearch) {
    startSearch = false;
    switch (request.command) {
        case kCommandPrepareMediaServerList:
            startSearch = true;
            return SuccessReply();
        case kCommandGetMediaServerList: {
            int offset = 0;
            int count = 0;
            if (!ParsePageArguments(request.arguments, offset, count))
                return ErrorReply("bad arguments");
            return ListReply(servers, offset, count);
        }
        default:
            return UnsupportedReply();
    }
}

std::string JsonString(const std::string& text) {
    static const char kHex[] = "0123456789abcdef";
    std::string out;
    out.reserve(text.size() + 2);
    out += '"';
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (c == '"' || c == '\\') {
            out += '\\';
            out += c;
        } else if (byte < 0x20 || byte == 0x7F) {
            out += "\\u00";
            out += kHex[byte >> 4];
            out += kHex[byte & 0xF];
        } else {
            out += c;
        }
    }
    out += '"';
    return out;
}

}  // namespace harmona::vanuaudiod
