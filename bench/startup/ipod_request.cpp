// A request that reads the iPod, as the refresh action (Part 2.3, target "ipod") and the root tree
// (Part 2.1) will serve it once they land: authorize, read the permission bits, build the iPod's
// children (Part 5.1), print them. Loads the libgpod plugin like those requests.
#include "AudioUsers.h"
#include "HarmonaHandler.h"

namespace {

class IPodRequest : public HarmonaHandler {
  public:
    int Serve() {
        if (!webMan.IsAuthorized(nullptr, 3, static_cast<tag_cgi_position>(3)))
            return 0;
        webMan.LoadIn();
        userPermission = AudioUsers::GetUserPermission(webMan.GetLoginUserName());
        if (userPermission == 0)
            return 0;
        Json::Value children(Json::arrayValue);
        AddIPodChildren(children);
        PrintResponse(children, kReplyContentType);
        return 1;
    }
};

}  // namespace

int main() {
    IPodRequest request;
    return request.Serve();
}
