#include "Utf8.h"

#include <vector>

namespace harmona::cgi {
namespace {

constexpr std::string_view kReplacement = "\xEF\xBF\xBD";

// Length of the well-formed sequence starting at text[i], or 0 (Unicode table 3-7).
std::size_t SequenceLength(std::string_view text, std::size_t i) {
    const auto byte = [&](std::size_t k) { return static_cast<unsigned char>(text[k]); };
    const unsigned char b0 = byte(i);
    if (b0 < 0x80)
        return 1;
    std::size_t length;
    unsigned char lo = 0x80, hi = 0xBF;
    if (b0 >= 0xC2 && b0 <= 0xDF) {
        length = 2;
    } else if (b0 >= 0xE0 && b0 <= 0xEF) {
        length = 3;
        if (b0 == 0xE0)
            lo = 0xA0;
        if (b0 == 0xED)
            hi = 0x9F;
    } else if (b0 >= 0xF0 && b0 <= 0xF4) {
        length = 4;
        if (b0 == 0xF0)
            lo = 0x90;
        if (b0 == 0xF4)
            hi = 0x8F;
    } else {
        return 0;
    }
    if (i + length > text.size())
        return 0;
    if (byte(i + 1) < lo || byte(i + 1) > hi)
        return 0;
    for (std::size_t k = 2; k < length; ++k) {
        if (byte(i + k) < 0x80 || byte(i + k) > 0xBF)
            return 0;
    }
    return length;
}

}  // namespace

bool IsValidUtf8(std::string_view text) {
    for (std::size_t i = 0; i < text.size();) {
        const std::size_t length = SequenceLength(text, i);
        if (length == 0)
            return false;
        i += length;
    }
    return true;
}

std::string RepairUtf8(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (std::size_t i = 0; i < text.size();) {
        const std::size_t length = SequenceLength(text, i);
        if (length == 0) {
            out += kReplacement;
            ++i;
        } else {
            out.append(text.substr(i, length));
            i += length;
        }
    }
    return out;
}

void RepairUtf8(Json::Value& value) {
    if (value.isString()) {
        const char* begin = nullptr;
        const char* end = nullptr;
        value.getString(&begin, &end);
        const std::string_view text(begin, static_cast<std::size_t>(end - begin));
        if (!IsValidUtf8(text))
            value = RepairUtf8(text);
    } else if (value.isArray()) {
        for (Json::Value& element : value)
            RepairUtf8(element);
    } else if (value.isObject()) {
        bool namesValid = true;
        for (const std::string& name : value.getMemberNames())
            namesValid = namesValid && IsValidUtf8(name);
        if (namesValid) {
            for (Json::Value& member : value)
                RepairUtf8(member);
            return;
        }
        // Rebuild the object under repaired names (two bad names may now coincide; the later wins).
        Json::Value repaired(Json::objectValue);
        for (const std::string& name : value.getMemberNames()) {
            Json::Value member = value[name];
            RepairUtf8(member);
            repaired[RepairUtf8(name)] = std::move(member);
        }
        value = std::move(repaired);
    }
}

}  // namespace harmona::cgi
