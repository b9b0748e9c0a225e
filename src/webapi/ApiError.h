// The error reply of the page's newer actions: an HTTP status, "success": false, the platform's
// errinfo with its text in the user's language (as every error of library.cgi has), and a stable
// "error" code (lower-case words with underscores) that the page turns into its own words.
#pragma once

#include "platform/cgi/ActionHandler.h"

namespace harmona::webapi {

inline constexpr const char* kJsonReplyType = "application/json; charset=\"UTF-8\"";

inline constexpr const char* kStatusBadRequest = "400 Bad Request";
inline constexpr const char* kStatusForbidden = "403 Forbidden";
inline constexpr const char* kStatusNotFound = "404 Not Found";
inline constexpr const char* kStatusMethodNotAllowed = "405 Method Not Allowed";
inline constexpr const char* kStatusConflict = "409 Conflict";
inline constexpr const char* kStatusTooLarge = "413 Payload Too Large";
inline constexpr const char* kStatusRangeNotSatisfiable = "416 Range Not Satisfiable";
inline constexpr const char* kStatusUnprocessable = "422 Unprocessable Entity";
inline constexpr const char* kStatusServerError = "500 Internal Server Error";
inline constexpr const char* kStatusBadGateway = "502 Bad Gateway";
inline constexpr const char* kStatusUnavailable = "503 Service Unavailable";
inline constexpr const char* kStatusGatewayTimeout = "504 Gateway Timeout";
inline constexpr const char* kStatusInsufficientStorage = "507 Insufficient Storage";

// The two UI texts that the errors show: "the entry could not be got" and "a system error".
inline constexpr const char* kNotFoundSection = "error";
inline constexpr const char* kNotFoundText = "Could not get the entry";
inline constexpr const char* kSystemSection = "common";
inline constexpr const char* kSystemText = "error_system";

struct ApiError {
    const char* status;
    const char* section;
    const char* key;
    int line;          // a fixed number that log readers match on
    const char* code;  // the "error" member
};

// The error reply's body: errinfo, the text of its section and key in the user's language as
// "message" (when the texts have it), and the "error" code.
Json::Value ErrorReply(ActionHandler& handler, WebMan& webMan, const ApiError& error);

// Prints the error reply; returns 0, the exit status of a request that failed.
int AnswerError(ActionHandler& handler, WebMan& webMan, const ApiError& error);

// True when the request came as a POST (changes are never made by a GET).
bool IsPostRequest();

}  // namespace harmona::webapi
