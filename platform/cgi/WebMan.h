// The request's CGI state: parameters, login user, UI language, preference directory. One object
// per request, owned by ActionHandler.
#pragma once

#include <string>

#include "platform/cgi/CgiParams.h"

// Where a CGI program stands in the platform's web application; 3 is the application's own CGI.
enum tag_cgi_position { CGI_POSITION_APPLICATION = 3 };

// The access level that the application's own CGI programs ask IsAuthorized for.
inline constexpr int kApplicationAccessLevel = 3;

class WebMan {
  public:
    // Nonzero when REMOTE_USER names a valid user (1 to 64 bytes, no '/', no control byte or 0x7f,
    // neither "." nor ".."). A refused caller gets the CGI header "Status: 401 Unauthorized" and an
    // empty line on standard output, and nothing else. A request that a page of another site sent
    // (RequestOrigin.h) is refused the same way.
    int IsAuthorized(const char* application, int level, tag_cgi_position position);

    // Loads the parameters: a urlencoded POST body first, then the query string.
    void LoadIn();

    // The first value of parameter `name`, or `defaultValue` when it is absent. The pointer stays
    // valid while this object lives.
    const char* In(const char* name, const char* defaultValue);

    // REMOTE_USER.
    std::string GetLoginUserName() const;

    // The user's language from users.conf when it is a known code, else the first mappable language
    // of Accept-Language, else "enu". Only the platform's language codes can come out, so the
    // result is safe in a path.
    std::string GetUILanguage();

    // "/usr/vanu/etc/preference/" followed by the user name.
    std::string GetPreferenceDir();

    // True when `name` is a valid user name in the sense of IsAuthorized.
    static bool IsValidUserName(const std::string& name);

  private:
    harmona::cgi::ParamList params_;
};
