#include "JsonWriter.h"

#include <json/writer.h>

#include <cstdio>
#include <map>

#include "Utf8.h"

namespace harmona::cgi {
namespace {

void WriteEscapedChar(unsigned char c, std::string& out) {
    switch (c) {
        case '"':
            out += "\\\"";
            break;
        case '\\':
            out += "\\\\";
            break;
        case '\b':
            out += "\\b";
            break;
        case '\f':
            out += "\\f";
            break;
        case '\n':
            out += "\\n";
            break;
        case '\r':
            out += "\\r";
            break;
        case '\t':
            out += "\\t";
            break;
        default: {
            char escape[8];
            std::snprintf(escape, sizeof(escape), "\\u%04x", c);
            out += escape;
        }
    }
}

void WriteString(const char* begin, const char* end, std::string& out) {
    out.push_back('"');
    const std::string_view text(begin, static_cast<std::size_t>(end - begin));
    // Copy runs of plain bytes at once; escape and repair the rest.
    std::size_t run = 0;
    for (std::size_t i = 0; i < text.size();) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        if (c >= 0x20 && c < 0x80 && c != '"' && c != '\\') {
            ++i;
            continue;
        }
        out.append(text.substr(run, i - run));
        if (c < 0x80) {
            WriteEscapedChar(c, out);
            ++i;
        } else {
            const std::size_t length = Utf8SequenceLength(text, i);
            if (length == 0) {
                out += "\xEF\xBF\xBD";
                ++i;
            } else {
                out.append(text.substr(i, length));
                i += length;
            }
        }
        run = i;
    }
    out.append(text.substr(run));
    out.push_back('"');
}

void WriteMember(const char* name, const char* end, const Json::Value& member, bool first,
                 std::string& out) {
    if (!first)
        out.push_back(',');
    WriteString(name, end, out);
    out.push_back(':');
    WriteCompactJson(member, out);
}

void WriteObject(const Json::Value& value, std::string& out) {
    bool namesValid = true;
    for (auto it = value.begin(); it != value.end() && namesValid; ++it) {
        const char* end = nullptr;
        const char* name = it.memberName(&end);
        namesValid = IsValidUtf8(std::string_view(name, static_cast<std::size_t>(end - name)));
    }
    out.push_back('{');
    bool first = true;
    if (namesValid) {
        for (auto it = value.begin(); it != value.end(); ++it) {
            const char* end = nullptr;
            const char* name = it.memberName(&end);
            WriteMember(name, end, *it, first, out);
            first = false;
        }
    } else {
        // Repaired names may coincide; an object keeps each name once (the later member wins), in
        // the order of the repaired names, as jsoncpp orders members.
        std::map<std::string, const Json::Value*> repaired;
        for (auto it = value.begin(); it != value.end(); ++it) {
            const char* end = nullptr;
            const char* name = it.memberName(&end);
            repaired[RepairUtf8(std::string_view(name, static_cast<std::size_t>(end - name)))] =
                &*it;
        }
        for (const auto& [name, member] : repaired) {
            WriteMember(name.data(), name.data() + name.size(), *member, first, out);
            first = false;
        }
    }
    out.push_back('}');
}

}  // namespace

void WriteCompactJson(const Json::Value& value, std::string& out) {
    switch (value.type()) {
        case Json::nullValue:
            out += "null";
            break;
        case Json::intValue:
            out += std::to_string(value.asLargestInt());
            break;
        case Json::uintValue:
            out += std::to_string(value.asLargestUInt());
            break;
        case Json::realValue:
            out += Json::valueToString(value.asDouble());
            break;
        case Json::booleanValue:
            out += value.asBool() ? "true" : "false";
            break;
        case Json::stringValue: {
            const char* begin = nullptr;
            const char* end = nullptr;
            value.getString(&begin, &end);
            WriteString(begin, end, out);
            break;
        }
        case Json::arrayValue: {
            out.push_back('[');
            bool first = true;
            for (const Json::Value& element : value) {
                if (!first)
                    out.push_back(',');
                first = false;
                WriteCompactJson(element, out);
            }
            out.push_back(']');
            break;
        }
        case Json::objectValue:
            WriteObject(value, out);
            break;
    }
}

}  // namespace harmona::cgi
