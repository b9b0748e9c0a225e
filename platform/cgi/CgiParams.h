// Decoding of CGI parameters: application/x-www-form-urlencoded text.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace harmona::cgi {

using ParamList = std::vector<std::pair<std::string, std::string>>;

// Decodes one component: `+` is a space, `%XY` is the byte XY, a malformed `%` sequence stays as it
// stands, and the text ends at its first decoded NUL byte.
std::string DecodeComponent(std::string_view text);

// Appends the parameters of `text` ("a=1&b&c=%41") to `out`, in order. A name without `=` has the
// empty value; empty pieces between `&` are skipped.
void DecodeForm(std::string_view text, ParamList& out);

// True when CONTENT_TYPE names application/x-www-form-urlencoded (case-insensitive, parameters
// such as "; charset=UTF-8" allowed).
bool IsFormContentType(const char* contentType);

// The body of a request is read only up to this size; a longer one is not read at all.
constexpr std::size_t kMaxBodyBytes = 1u << 20;
// How long the program waits for the web server to deliver the announced body.
constexpr int kBodyTimeoutMs = 10000;

// Parses CONTENT_LENGTH: a decimal number of at most kMaxBodyBytes; -1 for anything else.
long ParseContentLength(const char* text);

// Reads up to `length` bytes from `fd`, stopping at end of file or after `timeoutMs`.
std::string ReadBody(int fd, std::size_t length, int timeoutMs);

}  // namespace harmona::cgi
