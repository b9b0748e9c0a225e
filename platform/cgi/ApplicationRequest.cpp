#include "platform/cgi/ApplicationRequest.h"

#include "platform/users/AudioUsers.h"

namespace harmona::cgi {

AdmittedRequest AdmitApplicationRequest(WebMan& webMan) {
    AdmittedRequest request;
    if (!webMan.IsAuthorized(nullptr, kApplicationAccessLevel, CGI_POSITION_APPLICATION))
        return request;
    webMan.LoadIn();
    request.permission = AudioUsers::GetUserPermission(webMan.GetLoginUserName());
    request.admission = request.permission == 0 ? Admission::noPermission : Admission::admitted;
    return request;
}

}  // namespace harmona::cgi
