// A request that serves one playlist category's children (Part 4.1, with Parts 4.2 and 4.3), as
// the root tree (Part 2.1) and the refresh action (Part 2.3) will once they land: authorize, read
// the permission bits, build the children of the category named by the parameter `category`
// ("personal" or "shared"), print them.
#include <cstring>

#include "AudioUsers.h"
#include "HarmonaHandler.h"

namespace {

class CategoryRequest : public HarmonaHandler {
  public:
    int Serve() {
        if (!webMan.IsAuthorized(nullptr, 3, static_cast<tag_cgi_position>(3)))
            return 0;
        webMan.LoadIn();
        userPermission = AudioUsers::GetUserPermission(webMan.GetLoginUserName());
        const char* category = webMan.In("category", nullptr);
        if (userPermission == 0 || category == nullptr)
            return 0;
        Json::Value children(Json::arrayValue);
        if (std::strcmp(category, "shared") == 0)
            AddSharedPlaylistCategory(children);
        else
            AddPersonalPlaylistCategory(children);
        PrintResponse(children, kReplyContentType);
        return 1;
    }
};

}  // namespace

int main() {
    CategoryRequest request;
    return request.Serve();
}
