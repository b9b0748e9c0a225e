// Base class of a CGI handler of the platform: owns the request's WebMan and prints replies
// (platform/README.md, "Requests, users and permissions").
#pragma once

#include <json/value.h>

#include "platform/cgi/WebMan.h"

class ActionHandler {
  public:
    ActionHandler() = default;
    virtual ~ActionHandler();
    ActionHandler(const ActionHandler&) = delete;
    ActionHandler& operator=(const ActionHandler&) = delete;

    // The request operation; its result becomes the exit status.
    virtual int Process() = 0;

    // Prints "Content-Type: <type>" CR LF CR LF, then the value as compact UTF-8 JSON and a
    // newline. A null value prints as [], the empty list (top level only); invalid UTF-8 is
    // repaired.
    void PrintResponse(Json::Value value, const char* type);

    // The same, after the CGI header line "Status: <status>" (e.g. "404 Not Found"), for clients
    // that read the HTTP status.
    void PrintResponse(Json::Value value, const char* type, const char* status);

    // Makes `reply` an object (an array's elements move, in order, to the member "items"), then
    // sets "success": false and "errinfo": {"sec": section, "key": key, "line": line}.
    void SetError(Json::Value& reply, const char* section, const char* key, int line);

    // Makes `reply` an object the same way, then sets "success": success.
    void SetSuccess(Json::Value& reply, bool success);

  protected:
    WebMan webMan;
};

namespace harmona::cgi {
// The reply text that PrintResponse writes after the header: compact JSON, UTF-8, no newline.
std::string SerializeReply(Json::Value value);
}  // namespace harmona::cgi
