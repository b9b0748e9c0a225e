// Whether a request was sent by a page of another site (cross-site request forgery). A browser
// attaches the user's login to requests that any page it shows makes, so a page elsewhere could
// make the program act (draw a random playlist, start a media server search) in the user's name.
// Browsers say where a request comes from; clients that are not browsers (curl, scripts) send
// neither header and are not affected.
#pragma once

namespace harmona::cgi {

// True when the request must be refused as coming from another site:
// - `secFetchSite` (the Sec-Fetch-Site header) is present and neither "same-origin" nor "none"
//   (so "same-site" and "cross-site" are refused), or
// - `origin` (the Origin header) is present and does not name the request's own host `host` (the
//   Host header): its scheme is http or https, and what follows "://" equals `host`, letters of
//   any case, the scheme's default port (":80" for http, ":443" for https) written or not.
// An Origin of "null" (sandboxed frames, some redirects) or one without a Host to compare with is
// refused. Null pointers stand for absent headers.
bool IsCrossSiteRequest(const char* secFetchSite, const char* origin, const char* host);

}  // namespace harmona::cgi
