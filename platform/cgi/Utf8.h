// Repair of text that is not valid UTF-8, so that every reply is valid UTF-8 JSON.
#pragma once

#include <json/value.h>

#include <string>
#include <string_view>

namespace harmona::cgi {

// True when `text` is well-formed UTF-8 (no overlong forms, surrogates or values above U+10FFFF).
bool IsValidUtf8(std::string_view text);

// Each byte that does not start a well-formed sequence becomes U+FFFD.
std::string RepairUtf8(std::string_view text);

// Repairs every string and member name inside `value`, in place.
void RepairUtf8(Json::Value& value);

}  // namespace harmona::cgi
