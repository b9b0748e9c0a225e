#include "ActionHandler.h"

#include <cstdio>
#include <memory>
#include <sstream>

#include "JsonWriter.h"

namespace harmona::cgi {
namespace {

void MakeObject(Json::Value& reply) {
    if (reply.isObject())
        return;
    Json::Value object(Json::objectValue);
    if (reply.isArray()) {
        Json::Value items(Json::arrayValue);
        for (Json::Value& element : reply)
            items.append(std::move(element));
        object["items"] = std::move(items);
    }
    reply = std::move(object);
}

}  // namespace

std::string SerializeReply(Json::Value value) {
    // A null reply is the empty list, at the top level only.
    if (value.isNull())
        return "[]";
    std::string text;
    WriteCompactJson(value, text);
    return text;
}

}  // namespace harmona::cgi

ActionHandler::~ActionHandler() = default;

void ActionHandler::PrintResponse(Json::Value value, const char* type) {
    const std::string body = harmona::cgi::SerializeReply(std::move(value));
    std::printf("Content-Type: %s\r\n\r\n", type != nullptr ? type : "text/plain");
    std::fwrite(body.data(), 1, body.size(), stdout);
    std::fputc('\n', stdout);
    std::fflush(stdout);
}

void ActionHandler::SetError(Json::Value& reply, const char* section, const char* key, int line) {
    harmona::cgi::MakeObject(reply);
    reply["success"] = false;
    Json::Value errinfo(Json::objectValue);
    errinfo["sec"] = section != nullptr ? section : "";
    errinfo["key"] = key != nullptr ? key : "";
    errinfo["line"] = line;
    reply["errinfo"] = std::move(errinfo);
}

void ActionHandler::SetSuccess(Json::Value& reply, bool success) {
    harmona::cgi::MakeObject(reply);
    reply["success"] = success;
}
