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

// Length of the valid UTF-8 sequence at text[pos], or 0 when it is not one (overlong forms,
// surrogates and values above U+10FFFF refused).
std::size_t Utf8SequenceLength(const std::string& text, std::size_t pos) {
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned char lead = byte(pos);
    if (lead < 0x80)
        return 1;
    std::size_t length = 0;
    unsigned int minimum = 0;
    unsigned int codepoint = 0;
    if (lead >= 0xC2 && lead <= 0xDF) {
        length = 2, minimum = 0x80, codepoint = lead & 0x1F;
    } else if (lead >= 0xE0 && lead <= 0xEF) {
        length = 3, minimum = 0x800, codepoint = lead & 0x0F;
    } else if (lead >= 0xF0 && lead <= 0xF4) {
        length = 4, minimum = 0x10000, codepoint = lead & 0x07;
    } else {
        return 0;
    }
    if (pos + length > text.size())
        return 0;
    for (std::size_t i = 1; i < length; ++i) {
        if ((byte(pos + i) & 0xC0) != 0x80)
            return 0;
        codepoint = (codepoint << 6) | (byte(pos + i) & 0x3F);
    }
    if (codepoint < minimum || codepoint > 0x10FFFF || (codepoint >= 0xD800 && codepoint <= 0xDFFF))
        return 0;
    return length;
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

std::string CleanText(const std::string& text, std::size_t maxBytes) {
    std::string out;
    std::size_t pos = 0;
    while (pos < text.size()) {
        const std::size_t length = Utf8SequenceLength(text, pos);
        if (length == 0) {
            // Not UTF-8: one byte becomes one space.
            if (out.size() + 1 > maxBytes)
                break;
            out += ' ';
            ++pos;
            continue;
        }
        if (out.size() + length > maxBytes)
            break;  // cut before a character that would not fit whole
        const auto lead = static_cast<unsigned char>(text[pos]);
        if (length == 1 && (lead < 0x20 || lead == 0x7F))
            out += ' ';
        else
            out.append(text, pos, length);
        pos += length;
    }
    return out;
}

}  // namespace harmona::vanuaudiod
