// uilang.cgi: tells the tree page the login user's UI language, chosen exactly as the audio tree
// CGI chooses it (users.conf, then Accept-Language, then "enu"), so that the page speaks the
// language of the node texts it shows. Read-only; one tiny JSON reply:
//   {"language": "ger"}
// A caller that the platform refuses gets the platform's 401 and no body.
#include <json/value.h>

#include "platform/cgi/ActionHandler.h"

namespace {

const char kReplyType[] = "application/json; charset=\"UTF-8\"";

class UILanguageHandler : public ActionHandler {
  public:
    int Process() override {
        if (!webMan.IsAuthorized(nullptr, kApplicationAccessLevel, CGI_POSITION_APPLICATION))
            return 0;
        Json::Value reply(Json::objectValue);
        reply["language"] = webMan.GetUILanguage();
        PrintResponse(reply, kReplyType);
        return 1;
    }
};

}  // namespace

int main() {
    UILanguageHandler handler;
    // Exit status as the audio tree CGI's: 1 for a served request, 0 otherwise.
    return handler.Process();
}
