#include "src/webapi/ApiError.h"

#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/paths/PlatformPaths.h"
#include "platform/texts/LocalizedStringParser.h"

namespace harmona::webapi {

int AnswerError(ActionHandler& handler, WebMan& webMan, const ApiError& error) {
    Json::Value reply(Json::objectValue);
    handler.SetError(reply, error.section, error.key, error.line);
    const Json::Value texts = VANU::ZET::LocalizedStringParser::ParseTexts(
        std::string(paths::kTextsPrefix) + webMan.GetUILanguage());
    reply["message"] = texts[error.section][error.key].asString();
    reply["error"] = error.code;
    handler.PrintResponse(std::move(reply), kJsonReplyType, error.status);
    return 0;
}

bool IsPostRequest() {
    const char* method = std::getenv("REQUEST_METHOD");
    return method != nullptr && std::strcmp(method, "POST") == 0;
}

}  // namespace harmona::webapi
