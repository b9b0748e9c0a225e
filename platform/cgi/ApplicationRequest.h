// What every CGI program of the audio application does with a request before it looks at its
// action: the login check (WebMan::IsAuthorized, which also refuses a request of another site),
// the parameters, and the login user's audio permission bits. Written once, so that no program
// of the application can come to admit a request that another refuses.
#pragma once

#include "platform/cgi/WebMan.h"

namespace harmona::cgi {

// The audio permission bits of users.conf (platform/README.md, "Requests, users and permissions").
inline constexpr int kPermissionIPod = 1;
inline constexpr int kPermissionNewSharedPlaylist = 4;
inline constexpr int kPermissionMediaServer = 8;

enum class Admission {
    refused,       // not logged in, or sent by a page of another site: the 401 reply is printed
    noPermission,  // logged in, but the user's permission bits are 0; nothing printed
    admitted,
};

struct AdmittedRequest {
    Admission admission = Admission::refused;
    int permission = 0;  // the user's audio permission bits; 0 unless admitted
};

// Checks the caller with IsAuthorized (the application's level and position), then loads the
// request's parameters and reads the login user's permission bits (AudioUsers).
AdmittedRequest AdmitApplicationRequest(WebMan& webMan);

}  // namespace harmona::cgi
