// The compact JSON text of a reply, written in one pass: UTF-8 as it stands (no \u escapes for
// non-ASCII), every text repaired on the way (each byte that does not start a well-formed UTF-8
// sequence becomes U+FFFD), members in the order jsoncpp keeps them. Replaces a walk to repair the
// value and jsoncpp's stream writer, which cost most of a large reply's time.
#pragma once

#include <json/value.h>

#include <cstdio>
#include <string>

namespace harmona::cgi {

void WriteCompactJson(const Json::Value& value, std::string& out);

// The same text written to `file` in chunks as it is made; false when a write failed.
bool WriteCompactJson(const Json::Value& value, std::FILE* file);

}  // namespace harmona::cgi
