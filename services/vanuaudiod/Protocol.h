// The daemon's side of the CGI's daemon exchange: the request record, and commands 14 and 16 with
// their JSON replies (platform/README.md, "Audio daemon"). Pure functions: no sockets, no discovery
// state.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "platform/paths/DaemonProtocol.h"
#include "services/vanuaudiod/ServerList.h"

namespace harmona::vanuaudiod {

// The request record: a native-order int32 command and the NUL-terminated argument text, as the
// CGI's daemon client writes it (platform/paths/DaemonProtocol.h).
inline constexpr std::size_t kCommandSize = paths::kDaemonCommandSize;
inline constexpr std::size_t kArgumentSize = paths::kDaemonArgumentSize;
inline constexpr std::size_t kRequestSize = paths::kDaemonRequestSize;

// The CGI reads the reply of command 16 once into a buffer that must end with a NUL.
inline constexpr std::size_t kMaxReplySize = paths::kDaemonMaxReplySize;

inline constexpr int32_t kCommandPrepareMediaServerList =
    paths::kDaemonCommandPrepareMediaServerList;
inline constexpr int32_t kCommandGetMediaServerList = paths::kDaemonCommandGetMediaServerList;

// Bounds on what one list element may carry, so that a page of the CGI's paths::kDaemonListPageSize
// servers always fits in kMaxReplySize (each field's JSON form is at most twice its byte length,
// see JsonString).
inline constexpr std::size_t kMaxFriendlyNameBytes = 512;
inline constexpr std::size_t kMaxControlUrlBytes = 1024;
inline constexpr std::size_t kMaxUdnBytes = 256;
inline constexpr std::size_t kMaxIpBytes = 64;

struct Request {
    int32_t command = 0;
    std::string arguments;  // the text up to its NUL
};

// Reads a whole record. False when the argument area has no NUL (a record that cannot be trusted).
bool ParseRequest(const unsigned char* record, std::size_t size, Request& out);

// "offset count" exactly as the client prints it ("%d %d"): two decimal integers, each optionally
// with a leading '-', one space between, nothing else. Negative values are refused.
bool ParsePageArguments(const std::string& text, int& offset, int& count);

// The replies.
std::string SuccessReply();                 // {"success": true}
std::string ErrorReply(const char* error);  // {"success": false, "error": "..."}
std::string UnsupportedReply();             // error "unsupported"
// The page [offset, offset + count) of `servers`: {"success": true, "list": [...], "total": N}.
// The list stops early when the next element would make the reply longer than `maxBytes`; "total"
// is always the whole list's size, so a client that sees fewer elements than it asked for (and
// than remain) continues at offset + the number it got.
std::string ListReply(const std::vector<MediaServer>& servers, int offset, int count,
                      std::size_t maxBytes = kMaxReplySize);

// Answers one request (the daemon's command table); `startSearch` is set for command 14.
std::string Answer(const Request& request, const std::vector<MediaServer>& servers,
                   bool& startSearch);

// A JSON string literal of `text` (quotes included): '"' and '\\' escaped, control characters
// as \u00XX. Invalid UTF-8 must have been repaired before (util::CleanText with
// util::kPrintableUtf8, as Description.cpp does).
std::string JsonString(const std::string& text);

}  // namespace harmona::vanuaudiod
