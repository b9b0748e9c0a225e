#include "platform/cgi/JsonWriter.h"

#include <json/writer.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <map>

#include "common/util/Utf8.h"

namespace harmona::cgi {
namespace {

// Large replies are written in chunks of this size as they are made, so that a list of 100,000
// nodes never sits in memory a second time as one text.
constexpr std::size_t kChunkSize = 64 * 1024;

// Where the text goes: `text` alone, or `text` flushed to `file` whenever a list element ends
// past a chunk's size.
struct Output {
    std::string& text;
    std::FILE* file;
    bool failed = false;
    int holdFlush = 0;  // objects open whose text may still be taken back

    void Flush() {
        if (file != nullptr && !text.empty()) {
            failed = failed || std::fwrite(text.data(), 1, text.size(), file) != text.size();
            text.clear();
        }
    }
    void ElementDone() {
        if (file != nullptr && holdFlush == 0 && text.size() >= kChunkSize)
            Flush();
    }
};

void WriteValue(const Json::Value& value, Output& out);

void WriteEscapedChar(unsigned char c, Output& out) {
    switch (c) {
        case '"':
            out.text += "\\\"";
            break;
        case '\\':
            out.text += "\\\\";
            break;
        case '\b':
            out.text += "\\b";
            break;
        case '\f':
            out.text += "\\f";
            break;
        case '\n':
            out.text += "\\n";
            break;
        case '\r':
            out.text += "\\r";
            break;
        case '\t':
            out.text += "\\t";
            break;
        default: {
            char escape[8];
            std::snprintf(escape, sizeof(escape), "\\u%04x", c);
            out.text += escape;
        }
    }
}

// Bytes copied as they stand: printable ASCII other than the quote and the backslash.
constexpr std::array<bool, 256> kPlainBytes = [] {
    std::array<bool, 256> plain{};
    for (int c = 0x20; c < 0x80; ++c)
        plain[static_cast<std::size_t>(c)] = c != '"' && c != '\\';
    return plain;
}();

// True when none of the eight bytes of `word` needs escaping or repair: each is at least 0x20,
// below 0x80, and neither the quote nor the backslash (bit tricks that test eight bytes at once).
bool AllPlain(std::uint64_t word) {
    constexpr std::uint64_t kOnes = 0x0101010101010101ull;
    constexpr std::uint64_t kHighs = 0x8080808080808080ull;
    const auto hasZeroByte = [](std::uint64_t v) { return (v - kOnes) & ~v & kHighs; };
    const std::uint64_t controlOrHigh = ((word - 0x20 * kOnes) | word) & kHighs;
    return (controlOrHigh | hasZeroByte(word ^ ('"' * kOnes)) |
            hasZeroByte(word ^ ('\\' * kOnes))) == 0;
}

void WriteString(const char* begin, const char* end, Output& out) {
    out.text.push_back('"');
    const std::string_view text(begin, static_cast<std::size_t>(end - begin));
    const auto* bytes = reinterpret_cast<const unsigned char*>(begin);
    // Copy runs of plain bytes at once; escape and repair the rest.
    std::size_t run = 0;
    for (std::size_t i = 0; i < text.size();) {
        for (std::uint64_t word; i + 8 <= text.size(); i += 8) {
            std::memcpy(&word, bytes + i, 8);
            if (!AllPlain(word))
                break;
        }
        while (i < text.size() && kPlainBytes[bytes[i]])
            ++i;
        if (i == text.size())
            break;
        out.text.append(begin + run, i - run);
        const unsigned char c = bytes[i];
        if (c < 0x80) {
            WriteEscapedChar(c, out);
            ++i;
        } else {
            const std::size_t length = util::Utf8SequenceLength(text, i);
            if (length == 0) {
                out.text += "\xEF\xBF\xBD";
                ++i;
            } else {
                out.text.append(begin + i, length);
                i += length;
            }
        }
        run = i;
    }
    out.text.append(begin + run, text.size() - run);
    out.text.push_back('"');
}

void WriteMember(const char* name, const char* end, const Json::Value& member, bool first,
                 Output& out) {
    if (!first)
        out.text.push_back(',');
    WriteString(name, end, out);
    out.text.push_back(':');
    WriteValue(member, out);
}

// Members whose names need repair: repaired names may coincide, and an object keeps each name
// once (the later member wins), in the order of the repaired names, as jsoncpp orders members.
void WriteRepairedMembers(const Json::Value& value, Output& out) {
    std::map<std::string, const Json::Value*> repaired;
    for (auto it = value.begin(), end = value.end(); it != end; ++it) {
        const char* nameEnd = nullptr;
        const char* name = it.memberName(&nameEnd);
        repaired[util::RepairUtf8(
            std::string_view(name, static_cast<std::size_t>(nameEnd - name)))] = &*it;
    }
    bool first = true;
    for (const auto& [name, member] : repaired) {
        WriteMember(name.data(), name.data() + name.size(), *member, first, out);
        first = false;
    }
}

// One pass in the usual case: the members are written as their names are checked, and only a
// name that is not UTF-8 sends the object, from its start, through the repair. Nothing written
// since the object's start may reach the file before its end (holdFlush).
void WriteObject(const Json::Value& value, Output& out) {
    const std::size_t start = out.text.size();
    ++out.holdFlush;
    out.text.push_back('{');
    bool first = true;
    bool namesValid = true;
    for (auto it = value.begin(), end = value.end(); it != end; ++it) {
        const char* nameEnd = nullptr;
        const char* name = it.memberName(&nameEnd);
        if (!util::IsValidUtf8(std::string_view(name, static_cast<std::size_t>(nameEnd - name)))) {
            namesValid = false;
            break;
        }
        WriteMember(name, nameEnd, *it, first, out);
        first = false;
    }
    if (!namesValid) {
        out.text.resize(start + 1);
        WriteRepairedMembers(value, out);
    }
    out.text.push_back('}');
    --out.holdFlush;
}

void WriteValue(const Json::Value& value, Output& out) {
    switch (value.type()) {
        case Json::nullValue:
            out.text += "null";
            break;
        case Json::intValue:
            out.text += std::to_string(value.asLargestInt());
            break;
        case Json::uintValue:
            out.text += std::to_string(value.asLargestUInt());
            break;
        case Json::realValue:
            out.text += Json::valueToString(value.asDouble());
            break;
        case Json::booleanValue:
            out.text += value.asBool() ? "true" : "false";
            break;
        case Json::stringValue: {
            const char* begin = nullptr;
            const char* end = nullptr;
            value.getString(&begin, &end);
            WriteString(begin, end, out);
            break;
        }
        case Json::arrayValue: {
            out.text.push_back('[');
            bool first = true;
            for (const Json::Value& element : value) {
                if (!first)
                    out.text.push_back(',');
                first = false;
                WriteValue(element, out);
                out.ElementDone();
            }
            out.text.push_back(']');
            break;
        }
        case Json::objectValue:
            WriteObject(value, out);
            break;
    }
}

}  // namespace

void WriteCompactJson(const Json::Value& value, std::string& out) {
    Output output{out, nullptr};
    WriteValue(value, output);
}

bool WriteCompactJson(const Json::Value& value, std::FILE* file) {
    std::string text;
    text.reserve(2 * kChunkSize);
    Output output{text, file};
    WriteValue(value, output);
    output.Flush();
    return !output.failed;
}

}  // namespace harmona::cgi
