#include "src/webapi/ApiError.h"

#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/paths/PlatformPaths.h"
#include "platform/texts/LocalizedStringParser.h"

namespace harmona::webapi {

Json::Value ErrorReply(ActionHandler& handler, WebMan& webMan, const ApiError& error) {
    Json::Value reply(Json::objectValue);
    handler.SetError(reply, error.section, error.key, error.line);
    const Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts(
        std::string(paths::kTextsPrefix) + webMan.GetUILanguage());
    const Json::Value& text = texts[error.section][error.key];
    if (text.isString())
        reply["message"] = text.asString();
    reply["error"] = error.code;
    return reply;
}

int AnswerError(ActionHandler& handler, WebMan& webMan, const ApiError& error) {
    handler.PrintResponse(ErrorReply(handler, webMan, error), kJsonReplyType, error.status);
    return 0;
}

bool IsPostRequest() {
    const char* method = std::getenv("REQUEST_METHOD");
    return method != nullptr && std::strcmp(method, "POST") == 0;
}

}  // namespace harmona::webapi
